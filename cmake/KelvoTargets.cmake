# Settings that every target shares, and the functions that make our targets.

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR})
set(CMAKE_CXX_FLAGS_DEV "-O1 -g1")    # the everyday build type: quick to build, fit to debug
set(CMAKE_CXX_FLAGS_DEBUG "-O0 -g1")  # for the address sanitizer, whose checks take the optimiser long to see through
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
find_package(Threads REQUIRED)

add_library(kelvo_settings INTERFACE)
target_include_directories(kelvo_settings INTERFACE ${CMAKE_SOURCE_DIR}/src)
target_compile_options(kelvo_settings INTERFACE -Wall -Wextra -Wpedantic -Wshadow -Wnon-virtual-dtor
    -Woverloaded-virtual -Wformat=2 -Wimplicit-fallthrough -Werror)
# GCC 12 reports overlaps in its own std::string that cannot happen.
target_compile_options(kelvo_settings INTERFACE $<$<CXX_COMPILER_ID:GNU>:-Wno-restrict>)
target_compile_definitions(kelvo_settings INTERFACE KELVO_VERSION="${PROJECT_VERSION}")
target_link_libraries(kelvo_settings INTERFACE Threads::Threads)

if(KELVO_SANITIZE)
    # GCC warns that TSan does not model fences, of which we use none of our own.
    target_compile_options(kelvo_settings INTERFACE -fsanitize=${KELVO_SANITIZE} -fno-omit-frame-pointer
        -fno-sanitize-recover=all $<$<CXX_COMPILER_ID:GNU>:-Wno-tsan>)
    target_link_options(kelvo_settings INTERFACE -fsanitize=${KELVO_SANITIZE})
endif()
if(KELVO_FUZZ)
    target_compile_options(kelvo_settings INTERFACE -fsanitize=fuzzer-no-link)
endif()

# kelvo_compile_alone(FILE...): in the builds that compile a folder's files together, these files of the current folder
# stay apart: names that they keep to themselves are those of a neighbour's.
function(kelvo_compile_alone)
    set_source_files_properties(${ARGN} PROPERTIES SKIP_UNITY_BUILD_INCLUSION ON)
endfunction()

# kelvo_library(NAME [DEPENDS target...]): the static library of the current folder, from all its sources.
function(kelvo_library name)
    cmake_parse_arguments(ARG "" "" "DEPENDS" ${ARGN})
    file(GLOB sources CONFIGURE_DEPENDS *.cpp)
    add_library(${name} STATIC ${sources})
    target_link_libraries(${name} PUBLIC kelvo_settings ${ARG_DEPENDS})
endfunction()

# kelvo_test(NAME [SERIAL] [DEPENDS target...]): a GoogleTest program from all sources of the current folder. SERIAL: its
# tests look at the clock of the wall and run while no other test does.
function(kelvo_test name)
    cmake_parse_arguments(ARG "SERIAL" "" "DEPENDS" ${ARGN})
    file(GLOB sources CONFIGURE_DEPENDS *.cpp)
    add_executable(${name} ${sources})
    target_include_directories(${name} PRIVATE ${CMAKE_SOURCE_DIR}/tests)
    target_link_libraries(${name} PRIVATE kelvo_settings ${ARG_DEPENDS} kelvo_test_support)
    gtest_discover_tests(${name} NO_PRETTY_VALUES DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT 120 RUN_SERIAL ${ARG_SERIAL}
        ENVIRONMENT TSAN_OPTIONS=suppressions=${CMAKE_SOURCE_DIR}/tests/tsan-suppressions.txt
        ENVIRONMENT_MODIFICATION LSAN_OPTIONS=set:suppressions=${CMAKE_SOURCE_DIR}/tests/lsan-suppressions.txt)
endfunction()

# kelvo_loads_modules(TARGET): the program TARGET may load our modules, which use its base library: all of it is
# linked in and exported.
function(kelvo_loads_modules target)
    set_target_properties(${target} PROPERTIES ENABLE_EXPORTS ON
        LINK_LIBRARY_OVERRIDE "WHOLE_ARCHIVE,kelvo_base")
endfunction()
