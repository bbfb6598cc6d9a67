# The target: a 32-bit big-endian Linux. Its libraries lie under Debian's prefix for cross compilers, and those that
# Debian does not have for it under VORN_TARGET_PREFIX. Its programs run under qemu.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR ppc)
set(CMAKE_C_COMPILER powerpc-linux-gnu-gcc)
set(CMAKE_CXX_COMPILER powerpc-linux-gnu-g++)
set(CMAKE_LIBRARY_ARCHITECTURE powerpc-linux-gnu)

# Large files: the 32-bit readdir of the C library fails under qemu on folders of a 64-bit machine.
set(CMAKE_C_FLAGS_INIT "-m32 -mcpu=powerpc -D_FILE_OFFSET_BITS=64")
set(CMAKE_CXX_FLAGS_INIT "-m32 -mcpu=powerpc -D_FILE_OFFSET_BITS=64")

set(VORN_TARGET_ROOT /usr/powerpc-linux-gnu)
set(VORN_TARGET_PREFIX ${CMAKE_CURRENT_LIST_DIR}/../build/powerpc-prefix CACHE PATH "Libraries built for the target")
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES VORN_TARGET_PREFIX)
set(CMAKE_FIND_ROOT_PATH ${VORN_TARGET_PREFIX} ${VORN_TARGET_ROOT})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# Named outright, so that nothing of the machine's kernel has to know how to run these programs.
set(CMAKE_CROSSCOMPILING_EMULATOR "/usr/bin/qemu-ppc;-L;${VORN_TARGET_ROOT}")
