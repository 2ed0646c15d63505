# A toolchain file for Debian's cross compilers: -DKELVANE_TARGET=aarch64-linux-gnu, for instance.
# CTest runs a foreign program under QEMU's user-mode emulation.

set(CMAKE_TRY_COMPILE_PLATFORM_VARIABLES KELVANE_TARGET)
set(CMAKE_SYSTEM_NAME Linux)
string(REGEX MATCH "^[^-]+" CMAKE_SYSTEM_PROCESSOR "${KELVANE_TARGET}")
set(CMAKE_CXX_COMPILER ${KELVANE_TARGET}-g++)
if(NOT CMAKE_SYSTEM_PROCESSOR STREQUAL "i686")
  set(CMAKE_CROSSCOMPILING_EMULATOR /usr/bin/qemu-${CMAKE_SYSTEM_PROCESSOR}-static)
endif()
