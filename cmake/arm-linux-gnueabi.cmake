# 32-bit ARM Linux, whose programs qemu runs on any machine: the simulator and the loader that
# carries out the device's binary.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR arm)
set(CMAKE_C_COMPILER arm-linux-gnueabi-gcc)
set(CMAKE_CXX_COMPILER arm-linux-gnueabi-g++)
# The device's processors know no Thumb-2, and the library calls in and out in ARM code.
set(CMAKE_C_FLAGS_INIT "-marm")
set(CMAKE_CXX_FLAGS_INIT "-marm")
set(CMAKE_EXE_LINKER_FLAGS_INIT "-static")
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-arm)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
