# Warnings for the project's own targets.
add_library(vorn_warnings INTERFACE)
target_compile_options(vorn_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow -Wold-style-cast -Wcast-qual -Wcast-align
  -Wformat=2 -Wnull-dereference -Wundef -Wnon-virtual-dtor -Woverloaded-virtual -Wdouble-promotion
  $<$<CXX_COMPILER_ID:GNU>:-Wduplicated-cond -Wduplicated-branches -Wlogical-op>)
# A cast is needed on one machine where it is useless on another whose types are of one size.
if(NOT CMAKE_CROSSCOMPILING)
  target_compile_options(vorn_warnings INTERFACE $<$<CXX_COMPILER_ID:GNU>:-Wuseless-cast>)
endif()

option(VORN_WERROR "Treat warnings as errors" OFF)
if(VORN_WERROR)
  target_compile_options(vorn_warnings INTERFACE -Werror)
endif()
