# Cross build for 64-bit ARM Linux with Debian's aarch64-linux-gnu toolchain and the arm64
# multiarch -dev packages; test programs run under qemu-user.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)

set(KA_CROSS_TRIPLE aarch64-linux-gnu)
set(CMAKE_C_COMPILER ${KA_CROSS_TRIPLE}-gcc)
set(CMAKE_CXX_COMPILER ${KA_CROSS_TRIPLE}-g++)

# Headers and libraries of the target come from the multiarch folders only; programs (pkg-config,
# nm) from the host.
set(CMAKE_FIND_ROOT_PATH /usr/${KA_CROSS_TRIPLE})
set(CMAKE_LIBRARY_ARCHITECTURE ${KA_CROSS_TRIPLE})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY BOTH)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE BOTH)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE BOTH)

# pkg-config must report the arm64 .pc files, not the host's.
set(ENV{PKG_CONFIG_LIBDIR} /usr/lib/${KA_CROSS_TRIPLE}/pkgconfig:/usr/share/pkgconfig)

# Runs target programs: test discovery, ctest, and the programs the tests start themselves. The
# arm64 loader and libc come from the multiarch libc6:arm64 the -dev packages pull in, the same
# build as the libraries beside them; the cross toolchain's copy (-L /usr/aarch64-linux-gnu) can
# be a different Debian revision.
find_program(KA_QEMU NAMES qemu-aarch64-static qemu-aarch64)
if(KA_QEMU)
  set(CMAKE_CROSSCOMPILING_EMULATOR ${KA_QEMU})
endif()
