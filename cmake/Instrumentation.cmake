# What a build adds to every target of the project: a set of sanitizers, or the counters of gcov.
set(VORN_SANITIZE "" CACHE STRING "Sanitizers, separated by commas, e.g. address,undefined")
option(VORN_COVERAGE "Count executed lines and branches with gcov" OFF)

if(VORN_SANITIZE)
  add_compile_options(-fsanitize=${VORN_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${VORN_SANITIZE})
  if(CMAKE_SYSTEM_PROCESSOR STREQUAL "ppc")
    # The sanitizers' libraries want an operation on 8 bytes that this target's compiler library lacks.
    add_library(sanitizer_support STATIC ${CMAKE_CURRENT_LIST_DIR}/sanitizer_support.cpp)
    link_libraries($<$<NOT:$<STREQUAL:$<TARGET_PROPERTY:NAME>,sanitizer_support>>:sanitizer_support>)
    add_link_options(LINKER:--no-as-needed -latomic)
  endif()
endif()
if(VORN_COVERAGE)
  add_compile_options(--coverage -fno-inline)
  add_link_options(--coverage)
endif()
