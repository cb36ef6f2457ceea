# The compiler for the device: Windows CE on 32-bit ARM, of which it knows only the processor.
#
# What docs/platform.md says about each flag in short: code for the oldest core that can call and be
# called by Thumb code, no instruction that wants a stack aligned to 8 bytes, the device's sizes for
# enumerations, wide characters and `char`, and nothing that needs a run time for exceptions.
set(CMAKE_SYSTEM_NAME Generic)
set(CMAKE_SYSTEM_PROCESSOR arm)
set(CMAKE_CXX_COMPILER arm-none-eabi-g++)
set(CMAKE_TRY_COMPILE_TARGET_TYPE STATIC_LIBRARY)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(ORVENIX_CE ON)

string(CONCAT CMAKE_CXX_FLAGS_INIT
       "-marm -march=armv4t -mfloat-abi=soft -mabi=aapcs -fno-short-enums -fshort-wchar "
       "-fsigned-char -fno-unwind-tables -fno-asynchronous-unwind-tables "
       "-ffunction-sections -fdata-sections "
       # The C library for this processor counts 32 bits in `long`; the device and all else here in
       # `int`, as formats and the names of exported members show.
       "-U__INT32_TYPE__ -D__INT32_TYPE__=int "
       "-U__UINT32_TYPE__ \"-D__UINT32_TYPE__=unsigned int\"")
# A build tells nothing of the folder that it was made in.
cmake_path(GET CMAKE_CURRENT_LIST_DIR PARENT_PATH source_folder)
string(APPEND CMAKE_CXX_FLAGS_INIT " -ffile-prefix-map=${source_folder}=.")
set(CMAKE_ASM_FLAGS_INIT "-march=armv4t")
set(CMAKE_CXX_FLAGS_MINSIZEREL "-Os -g -DNDEBUG" CACHE STRING "Flags of a build for size")
