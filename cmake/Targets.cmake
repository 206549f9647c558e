# Settings that every target of ours shares, and the small functions that declare them.

add_library(mirabel_settings INTERFACE)
target_include_directories(mirabel_settings INTERFACE ${CMAKE_SOURCE_DIR}/src
                                                      ${CMAKE_SOURCE_DIR}/include)
target_compile_options(mirabel_settings INTERFACE -Wall -Wextra -Wpedantic -Wshadow -Wconversion
                                                  -Wno-sign-conversion -Wnon-virtual-dtor)
if(MIRABEL_WERROR)
  target_compile_options(mirabel_settings INTERFACE -Werror)
endif()
if(MIRABEL_SANITIZE)
  target_compile_options(mirabel_settings INTERFACE -fsanitize=${MIRABEL_SANITIZE}
                                                    -fno-omit-frame-pointer
                                                    -fno-sanitize-recover=all)
  target_link_options(mirabel_settings INTERFACE -fsanitize=${MIRABEL_SANITIZE})
endif()
if(CMAKE_BUILD_TYPE STREQUAL "Debug" OR CMAKE_BUILD_TYPE STREQUAL "RelWithDebInfo")
  # Standard-library preconditions are checked wherever people develop.
  target_compile_definitions(mirabel_settings INTERFACE _GLIBCXX_ASSERTIONS)
endif()

# Several sources as one: half the time where everything is built, more where one file has changed.
function(mirabel_unity target)
  if(MIRABEL_UNITY)
    set_target_properties(${target} PROPERTIES UNITY_BUILD ON UNITY_BUILD_BATCH_SIZE ${MIRABEL_UNITY_BATCH})
  endif()
endfunction()

# One folder of src/ as a library of objects. The folders that it may import are named after
# LINKS, so that an import up the list of layers does not even link.
function(mirabel_layer name)
  cmake_parse_arguments(ARG "" "" "SOURCES;LINKS;SYSTEM" ${ARGN})
  add_library(mirabel_${name} STATIC ${ARG_SOURCES})
  # The shared library is made of the layers, and shows nothing of them but what says so.
  set_target_properties(mirabel_${name} PROPERTIES POSITION_INDEPENDENT_CODE ON
                        CXX_VISIBILITY_PRESET hidden VISIBILITY_INLINES_HIDDEN ON)
  mirabel_unity(mirabel_${name})
  target_link_libraries(mirabel_${name} PUBLIC mirabel_settings Threads::Threads)
  foreach(link IN LISTS ARG_LINKS)
    target_link_libraries(mirabel_${name} PUBLIC mirabel_${link})
  endforeach()
  target_link_libraries(mirabel_${name} PRIVATE ${ARG_SYSTEM})
endfunction()

# What the tests run with: under a sanitizer, what is known of other libraries.
set(mirabel_test_environment "")
if(MIRABEL_SANITIZE MATCHES thread)
  set(mirabel_test_environment ENVIRONMENT
      "TSAN_OPTIONS=suppressions=${CMAKE_SOURCE_DIR}/tests/races.supp:print_suppressions=0")
elseif(MIRABEL_SANITIZE)
  set(mirabel_test_environment ENVIRONMENT
      "LSAN_OPTIONS=suppressions=${CMAKE_SOURCE_DIR}/tests/leaks.supp:print_suppressions=0")
endif()

# One folder of tests/ as one test program, whose cases ctest sees one by one; TIMEOUT is what one
# case may take, in seconds.
function(mirabel_tests name)
  cmake_parse_arguments(ARG "" "TIMEOUT" "SOURCES;LINKS;LABELS" ${ARGN})
  if(NOT ARG_TIMEOUT)
    set(ARG_TIMEOUT 300)
  endif()
  add_executable(${name} ${ARG_SOURCES})
  mirabel_unity(${name})
  target_include_directories(${name} PRIVATE ${CMAKE_SOURCE_DIR}/tests)
  target_link_libraries(${name} PRIVATE mirabel_settings ${ARG_LINKS} GTest::gmock GTest::gtest
                                        GTest::gtest_main)
  # Half the time to build them; it is in what they test that time is spent when they run.
  target_compile_options(${name} PRIVATE -O0)
  if(MIRABEL_SANITIZE MATCHES undefined)
    # A third of that again; what may be undefined is looked for in what they test.
    target_compile_options(${name} PRIVATE -fno-sanitize=undefined)
  endif()
  gtest_discover_tests(${name} DISCOVERY_MODE PRE_TEST DISCOVERY_TIMEOUT 60
                       PROPERTIES TIMEOUT ${ARG_TIMEOUT} ${mirabel_test_environment}
                                  LABELS "${ARG_LABELS}")
endfunction()
