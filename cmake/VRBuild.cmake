# Project-wide compile settings and the helpers every folder uses.

find_program(VR_CCACHE ccache)
if(VR_CCACHE)
    set(CMAKE_C_COMPILER_LAUNCHER "${VR_CCACHE}")
    set(CMAKE_CXX_COMPILER_LAUNCHER "${VR_CCACHE}")
endif()

add_compile_options(-Wall -Wextra -Werror)
# GCC 12 at -O2/-O3 reports -Wrestrict on "literal" + std::string once the
# concatenation is inlined inside libstdc++: a known false positive of that
# compiler, so that one warning is off for GCC 12 only.
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_GREATER_EQUAL 12
   AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
    add_compile_options(-Wno-restrict)
endif()

if(VR_COVERAGE)
    # Atomic counters: the suites run real threads, and racing counters corrupt the counts.
    add_compile_options(--coverage -fprofile-update=atomic)
    add_link_options(--coverage)
endif()

if(VR_SANITIZE)
    list(JOIN VR_SANITIZE "," _vr_san)
    add_compile_options(-fsanitize=${_vr_san} -fno-omit-frame-pointer -fno-sanitize-recover=all)
    add_link_options(-fsanitize=${_vr_san})
endif()

# vr_add_library(NAME <sources...>): a host or module library with its public
# headers in include/ and its private ones beside the sources in src/.
# The target is NAME with the aliases VR::NAME and VideoRenderer::NAME (the
# name the installed package gives it). It is installed with its headers
# (cmake/VRInstall.cmake); its users need C++20.
function(vr_add_library NAME)
    add_library(${NAME} SHARED ${ARGN})
    add_library(VR::${NAME} ALIAS ${NAME})
    add_library(VideoRenderer::${NAME} ALIAS ${NAME})
    target_include_directories(${NAME}
        PUBLIC $<BUILD_INTERFACE:${CMAKE_CURRENT_SOURCE_DIR}/include>
               $<INSTALL_INTERFACE:${VR_INSTALL_INCLUDEDIR}>
        PRIVATE ${CMAKE_CURRENT_SOURCE_DIR}/src)
    target_compile_features(${NAME} PUBLIC cxx_std_20)
    set_target_properties(${NAME} PROPERTIES OUTPUT_NAME vr_${NAME})
    vr_install_library(${NAME})
endfunction()

# vr_add_test(NAME SOURCES <files...> LIBS <targets...> [THREADED])
# One GoogleTest executable, run by ctest as one test. THREADED marks suites
# that exercise real concurrency; the ThreadSanitizer run builds and runs
# only those (target `threaded_tests`, ctest label `threaded`).
function(vr_add_test NAME)
    cmake_parse_arguments(T "THREADED" "" "SOURCES;LIBS" ${ARGN})
    add_executable(${NAME} ${T_SOURCES})
    target_include_directories(${NAME} PRIVATE ${PROJECT_SOURCE_DIR}/tests/support)
    target_link_libraries(${NAME} PRIVATE ${T_LIBS} GTest::gtest GTest::gmock GTest::gtest_main
                                          Threads::Threads)
    add_test(NAME ${NAME} COMMAND ${NAME} --gtest_brief=1)
    set(_labels unit)
    if(T_THREADED)
        list(APPEND _labels threaded)
        set_property(GLOBAL APPEND PROPERTY VR_THREADED_TESTS ${NAME})
    endif()
    set_tests_properties(${NAME} PROPERTIES LABELS "${_labels}" TIMEOUT 600)
    set_property(GLOBAL APPEND PROPERTY VR_ALL_TESTS ${NAME})
endfunction()

function(vr_finish_tests)
    get_property(_threaded GLOBAL PROPERTY VR_THREADED_TESTS)
    get_property(_all GLOBAL PROPERTY VR_ALL_TESTS)
    add_custom_target(threaded_tests)
    if(_threaded)
        add_dependencies(threaded_tests ${_threaded})
    endif()
    add_custom_target(all_tests)
    if(_all)
        add_dependencies(all_tests ${_all})
    endif()
endfunction()

# vr_add_benchmark(NAME <sources...> LIBS <targets...>)
function(vr_add_benchmark NAME)
    cmake_parse_arguments(B "" "" "SOURCES;LIBS" ${ARGN})
    add_executable(${NAME} ${B_SOURCES})
    target_link_libraries(${NAME} PRIVATE ${B_LIBS} benchmark::benchmark benchmark::benchmark_main
                                          Threads::Threads)
endfunction()
