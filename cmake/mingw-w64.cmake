# The compiler for desktop Windows; mingw-w64-i686.cmake asks for the one for 32 bits.
set(CMAKE_SYSTEM_NAME Windows)
if(NOT CMAKE_SYSTEM_PROCESSOR)
  set(CMAKE_SYSTEM_PROCESSOR x86_64)
endif()
# Debian has two kinds of each; the tests' threads need this one.
set(mingw ${CMAKE_SYSTEM_PROCESSOR}-w64-mingw32)
find_program(ORVENIX_MINGW_${CMAKE_SYSTEM_PROCESSOR} NAMES ${mingw}-g++-posix ${mingw}-g++)
set(CMAKE_CXX_COMPILER ${ORVENIX_MINGW_${CMAKE_SYSTEM_PROCESSOR}})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
