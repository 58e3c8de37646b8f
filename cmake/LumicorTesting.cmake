# GoogleTest is built from Debian's source package so that the same sources
# serve the native, sanitizer and cross (armhf) builds.
set(LUMICOR_GTEST_SOURCE_DIR /usr/src/googletest CACHE PATH "GoogleTest sources")
set(INSTALL_GTEST OFF CACHE BOOL "" FORCE)
set(BUILD_GMOCK ON CACHE BOOL "" FORCE)
add_subdirectory(${LUMICOR_GTEST_SOURCE_DIR} ${PROJECT_BINARY_DIR}/googletest EXCLUDE_FROM_ALL)
# GoogleTest's own code is not held to our warning level.
foreach(t gtest gtest_main gmock gmock_main)
  if(TARGET ${t})
    target_compile_options(${t} PRIVATE -w)
  endif()
endforeach()
include(GoogleTest)

# Shared test helpers: allocation-failure injection, synthetic images, blob builders.
file(GLOB testkit_sources CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/testkit/*.cpp)
add_library(lumicor_testkit STATIC ${testkit_sources})
target_include_directories(lumicor_testkit PUBLIC ${PROJECT_SOURCE_DIR}/tests ${PROJECT_SOURCE_DIR})
target_link_libraries(lumicor_testkit PUBLIC Lumicor_static GTest::gtest)
# Every malloc-family call of the library goes through the testkit so that a
# test can make the Nth allocation fail.
set(LUMICOR_TEST_WRAP_LINK -Wl,--wrap=malloc -Wl,--wrap=calloc -Wl,--wrap=realloc)

set(LUMICOR_TEST_DATA_DIR ${PROJECT_SOURCE_DIR}/tests/data)

# One test executable per area: <area>/tests/*.cpp and tests/<area>/*.cpp.
foreach(area ${LUMICOR_AREAS})
  # C files in a test folder check that public headers compile as C.
  file(GLOB area_tests CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/${area}/tests/*.cpp
                                         ${PROJECT_SOURCE_DIR}/${area}/tests/*.c
                                         ${PROJECT_SOURCE_DIR}/tests/${area}/*.cpp)
  if(area_tests)
    add_executable(${area}_tests ${area_tests})
    target_link_libraries(${area}_tests PRIVATE lumicor_testkit GTest::gtest_main GTest::gmock ${LUMICOR_TEST_WRAP_LINK})
    target_include_directories(${area}_tests PRIVATE ${PROJECT_SOURCE_DIR})
    target_compile_definitions(${area}_tests PRIVATE LUMICOR_TEST_DATA_DIR="${LUMICOR_TEST_DATA_DIR}"
                                                     LUMICOR_SOURCE_DIR="${PROJECT_SOURCE_DIR}"
                                                     LUMICOR_FACE_SAMPLES_DIR="${LUMICOR_FACE_SAMPLES_DIR}")
    gtest_discover_tests(${area}_tests DISCOVERY_TIMEOUT 120 PROPERTIES TIMEOUT 600)
  endif()
endforeach()

# The installed library, headers, pkg-config file and CMake package work for a
# C host program.
if(NOT CMAKE_CROSSCOMPILING AND NOT LUMICOR_SANITIZE)
  add_test(NAME install.consumer
           COMMAND sh ${PROJECT_SOURCE_DIR}/tests/install/check_install.sh ${PROJECT_BINARY_DIR})
endif()
