# What tests and benchmarks on a simulated device stand on.
include_guard(GLOBAL)
find_package(GTest REQUIRED)
find_package(ZLIB REQUIRED)
set(here ${CMAKE_CURRENT_LIST_DIR})

# gtest's own macros; comes behind the warnings that it takes back
add_library(orvenix_test_options INTERFACE)
target_compile_options(orvenix_test_options INTERFACE -Wno-sign-conversion -Wno-conversion)
# The product has no run-time type information for the sanitizer to look at. What else is left out
# here is a third of the time that compiling the tests takes, and of a test's own pointers the address
# sanitizer tells as much.
target_compile_options(orvenix_test_options INTERFACE
                       -fno-sanitize=vptr,null,alignment,object-size)

# The fixture that makes a test a program of a simulated device.
orvenix_sources(support_sources ${here}/support)
add_library(test_support STATIC ${support_sources})
target_include_directories(test_support PUBLIC ${here})
target_link_libraries(test_support PRIVATE orvenix_warnings orvenix_test_options
                                   PUBLIC cesim GTest::gmock GTest::gtest)

# Jobs, servers and devices for tests of the product.
orvenix_sources(product_support_sources ${here}/product_support)
add_library(product_test_support STATIC ${product_support_sources})
target_link_libraries(product_test_support PRIVATE orvenix_warnings orvenix_test_options
                                           PUBLIC test_support orvenix_server ZLIB::ZLIB)
target_link_libraries(product_test_support PUBLIC orvenix_platform)
target_include_directories(product_test_support PUBLIC ${PROJECT_SOURCE_DIR}/src
                                                       ${PROJECT_SOURCE_DIR}/include)
