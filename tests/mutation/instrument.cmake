# Included by the project() of a build in which the module is made of the copy below MUTATED_COPY. Every executable gets
# the switch between the mutants.

find_package(GTest REQUIRED)
add_library(mutation_runtime OBJECT ${CMAKE_CURRENT_LIST_DIR}/runtime.cpp ${CMAKE_CURRENT_LIST_DIR}/listener.cpp)
target_compile_features(mutation_runtime PRIVATE cxx_std_17)
target_link_libraries(mutation_runtime PRIVATE GTest::gtest)

include_directories(BEFORE ${MUTATED_COPY})
add_compile_options("SHELL:-include ${CMAKE_CURRENT_LIST_DIR}/runtime.h")
link_libraries($<$<STREQUAL:$<TARGET_PROPERTY:TYPE>,EXECUTABLE>:$<TARGET_OBJECTS:mutation_runtime>>)

# The tests themselves stay where they are, and those that read the sources read the originals.
function(mutation_use_copy)
  get_target_property(folder module_objects SOURCE_DIR)
  get_target_property(sources module_objects SOURCES)
  file(RELATIVE_PATH below ${CMAKE_SOURCE_DIR} ${folder})
  list(TRANSFORM sources PREPEND ${MUTATED_COPY}/${below}/)
  set_target_properties(module_objects PROPERTIES SOURCES "${sources}")
endfunction()
cmake_language(DEFER DIRECTORY ${CMAKE_SOURCE_DIR} CALL mutation_use_copy)
