# Warnings, sanitizers and the rules of the product's sources.

add_library(orvenix_warnings INTERFACE)
target_compile_options(orvenix_warnings INTERFACE
  -Werror -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wsign-conversion -Wold-style-cast
  -Wcast-align -Wnon-virtual-dtor -Woverloaded-virtual -Wimplicit-fallthrough -Wformat=2)

# The device's library is linked without the run times of exceptions, RTTI and thread-safe statics.
add_library(orvenix_product_rules INTERFACE)
target_compile_options(orvenix_product_rules INTERFACE
  -fno-exceptions -fno-rtti -fno-threadsafe-statics -fvisibility=hidden
  -fvisibility-inlines-hidden)
if(NOT CMAKE_BUILD_TYPE STREQUAL "Debug" AND NOT ORVENIX_SANITIZE)
  target_compile_options(orvenix_product_rules INTERFACE -Wframe-larger-than=4096)
endif()

if(ORVENIX_SANITIZE)
  add_compile_options(-fsanitize=${ORVENIX_SANITIZE} -fno-sanitize-recover=all
                      -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${ORVENIX_SANITIZE})
  if(CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
    # Compares the types of functions by their descriptions, of which each library has its own.
    add_compile_options(-fno-sanitize=function)
  elseif(ORVENIX_SANITIZE STREQUAL "thread")
    # The event library's fences, which this sanitizer does not see, order nothing between threads
    # here: each loop has one.
    add_compile_options(-Wno-tsan)
  endif()
endif()

# What is fuzzed reports which of its branches an input takes.
if(ORVENIX_FUZZ)
  add_compile_options(-fsanitize=fuzzer-no-link)
endif()

# Sources by folder: a new file needs no line in a list.
function(orvenix_sources result)
  set(found)
  foreach(folder IN LISTS ARGN)
    # One spelling of each path, so that lists can be subtracted.
    cmake_path(ABSOLUTE_PATH folder NORMALIZE OUTPUT_VARIABLE absolute)
    cmake_path(APPEND absolute "*.cpp")
    file(GLOB_RECURSE here CONFIGURE_DEPENDS ${absolute})
    list(APPEND found ${here})
  endforeach()
  set(${result} ${found} PARENT_SCOPE)
endfunction()
