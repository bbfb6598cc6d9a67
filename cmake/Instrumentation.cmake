# What a build adds to every target of the project: a set of sanitizers, or the counters of gcov.
set(VORN_SANITIZE "" CACHE STRING "Sanitizers, separated by commas, e.g. address,undefined")
option(VORN_COVERAGE "Count executed lines and branches with gcov" OFF)

if(VORN_SANITIZE)
  add_compile_options(-fsanitize=${VORN_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${VORN_SANITIZE})
endif()
if(VORN_COVERAGE)
  add_compile_options(--coverage -fno-inline)
  add_link_options(--coverage)
endif()
