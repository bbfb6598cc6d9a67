# GoogleTest: the machine's library, or for another target Debian's sources of it. A macro, since the targets of a package
# are known only to the folder that looks for it.
include(GoogleTest)
macro(vorn_find_test_library)
  if(NOT CMAKE_CROSSCOMPILING)
    find_package(GTest REQUIRED)
  elseif(NOT TARGET GTest::gmock_main)
    add_subdirectory(/usr/src/googletest ${PROJECT_BINARY_DIR}/googletest EXCLUDE_FROM_ALL)
    foreach(library gtest gtest_main gmock gmock_main)
      target_compile_options(${library} PRIVATE -fno-sanitize=all)
    endforeach()
  endif()
endmacro()
