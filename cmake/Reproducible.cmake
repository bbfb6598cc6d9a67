# The same sources give the same bytes wherever they lie and wherever they are built: no path of this machine gets into
# what is built for others. A debugger looks for the sources in one folder, whoever built. Debug builds keep the paths.
# Of several that match, the compiler takes the last.
if(CMAKE_BUILD_TYPE MATCHES "^(Release|MinSizeRel)$")
  set(place /usr/src/vorn-directory-domain)
  add_compile_options(-ffile-prefix-map=${PROJECT_SOURCE_DIR}=${place} -ffile-prefix-map=${PROJECT_BINARY_DIR}=${place}/build)
  if(VORN_TARGET_PREFIX)
    get_filename_component(prefix ${VORN_TARGET_PREFIX} ABSOLUTE)
    add_compile_options(
      -ffile-prefix-map=${VORN_TARGET_PREFIX}=${place}/build/prefix -ffile-prefix-map=${prefix}=${place}/build/prefix)
    unset(prefix)
  endif()
  unset(place)
endif()
# A program finds the libraries that are built beside it by a way that does not begin at "/".
set(CMAKE_BUILD_RPATH_USE_ORIGIN ON)
