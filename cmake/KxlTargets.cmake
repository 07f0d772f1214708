# Shared settings for the project's own targets.

if(KXL_SANITIZE)
  # -O1 keeps instrumented worlds and programs quick enough for the scenario tests.
  add_compile_options(-O1 -fsanitize=address,undefined -fno-omit-frame-pointer -fno-sanitize-recover=undefined)
  add_link_options(-fsanitize=address,undefined)
endif()

if(WIN32)
  # One self-contained executable per program: no runtime DLLs to ship to Wine.
  add_link_options(-static -static-libgcc -static-libstdc++)
  set(KXL_WINDOWS ON)
else()
  set(KXL_WINDOWS OFF)
endif()

# kxl_warnings(target): the house warning level on our own code.
function(kxl_warnings target)
  target_compile_options(${target} PRIVATE -Wall -Wextra -Werror)
  if(KXL_SANITIZE)
    # Instrumented code makes GCC report uninitialised reads inside the standard
    # library (std::regex, std::function) that are not there.
    target_compile_options(${target} PRIVATE -Wno-maybe-uninitialized)
  endif()
endfunction()

# Test framework: the system package natively; built from Debian's GoogleTest
# sources for the cross build, which has no packaged libraries.
if(KXL_BUILD_TESTS)
  enable_testing()
  if(WIN32)
    set(gtest_disable_pthreads OFF CACHE BOOL "" FORCE)
    set(INSTALL_GTEST OFF CACHE BOOL "" FORCE)
    add_subdirectory(/usr/src/googletest ${CMAKE_BINARY_DIR}/googletest EXCLUDE_FROM_ALL)
    if(NOT TARGET GTest::gtest_main)
      add_library(GTest::gtest ALIAS gtest)
      add_library(GTest::gtest_main ALIAS gtest_main)
      add_library(GTest::gmock ALIAS gmock)
    endif()
  else()
    find_package(GTest REQUIRED)
  endif()
  include(GoogleTest)
endif()

# kxl_add_gtest(name SOURCES ... LIBS ...): one test executable registered with CTest.
# Cross-built tests run through CMAKE_CROSSCOMPILING_EMULATOR (Wine).
function(kxl_add_gtest name)
  cmake_parse_arguments(T "" "" "SOURCES;LIBS" ${ARGN})
  add_executable(${name} ${T_SOURCES})
  kxl_warnings(${name})
  target_link_libraries(${name} PRIVATE ${T_LIBS} GTest::gtest_main)
  if(WIN32)
    add_test(NAME ${name} COMMAND ${name})
    # One Wine prefix per build directory, so builds do not share a machine.
    set_tests_properties(${name} PROPERTIES ENVIRONMENT "KXL_WINEPREFIX=${CMAKE_BINARY_DIR}/wineprefix")
  else()
    # A row of a table prints as its bytes, pointers included: named by its
    # index instead, a case keeps its name from one build to the next.
    gtest_discover_tests(${name} DISCOVERY_TIMEOUT 60 NO_PRETTY_VALUES PROPERTIES TIMEOUT 120)
  endif()
endfunction()
