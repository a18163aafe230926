# Install layout, run-time search paths and the exported package.
#
#   bin/                           vrender
#   lib/                           libVideoRenderer.so, libvr_<host library>.so
#   lib/videorenderer/plugins/     plug-ins made by vr_add_plugin
#   include/videorenderer/         every library's public headers, one tree
#                                  (ML/..., QRT/..., MF/..., mvxcore/..., ...)
#   lib/cmake/VideoRenderer/       VideoRendererConfig.cmake: find_package(VideoRenderer)
#                                  gives VideoRenderer::VideoRenderer and
#                                  VideoRenderer::<host library>
#   lib/pkgconfig/videorenderer.pc

include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

set(VR_INSTALL_INCLUDEDIR "${CMAKE_INSTALL_INCLUDEDIR}/videorenderer")
set(VR_INSTALL_PLUGINDIR "${CMAKE_INSTALL_LIBDIR}/videorenderer/plugins")
set(VR_INSTALL_CMAKEDIR "${CMAKE_INSTALL_LIBDIR}/cmake/VideoRenderer")
set(VR_INSTALL_PKGCONFIGDIR "${CMAKE_INSTALL_LIBDIR}/pkgconfig")
set(VR_EXPORT_SET VideoRendererTargets)

# The run-time search path of an installed binary in inFromDir: the library
# directory relative to it ($ORIGIN/../lib for bin/), so that an installed
# tree works wherever it is moved. Absolute install directories give the
# absolute library directory.
function(vr_install_rpath OUT inFromDir)
    if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}" OR IS_ABSOLUTE "${inFromDir}")
        set(${OUT} "${CMAKE_INSTALL_FULL_LIBDIR}" PARENT_SCOPE)
        return()
    endif()
    file(RELATIVE_PATH _rel "/_root/${inFromDir}" "/_root/${CMAKE_INSTALL_LIBDIR}")
    string(REGEX REPLACE "/$" "" _rel "${_rel}")
    if(_rel STREQUAL "")
        set(${OUT} "$ORIGIN" PARENT_SCOPE)
    else()
        set(${OUT} "$ORIGIN/${_rel}" PARENT_SCOPE)
    endif()
endfunction()

# vr_install_library(NAME): installs a library made by vr_add_library, with
# its public headers, into the exported package as VideoRenderer::NAME.
function(vr_install_library NAME)
    vr_install_rpath(_rpath "${CMAKE_INSTALL_LIBDIR}")
    set_target_properties(${NAME} PROPERTIES INSTALL_RPATH "${_rpath}" EXPORT_NAME ${NAME})
    install(TARGETS ${NAME} EXPORT ${VR_EXPORT_SET}
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
        ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
        RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
    install(DIRECTORY ${CMAKE_CURRENT_SOURCE_DIR}/include/
        DESTINATION ${VR_INSTALL_INCLUDEDIR}
        FILES_MATCHING PATTERN "*.h")
endfunction()

# vr_install_program(NAME): installs an executable into bin/.
function(vr_install_program NAME)
    vr_install_rpath(_rpath "${CMAKE_INSTALL_BINDIR}")
    set_target_properties(${NAME} PROPERTIES INSTALL_RPATH "${_rpath}")
    install(TARGETS ${NAME} RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
endfunction()

# vr_add_plugin(NAME <sources...> [LIBS <targets...>]): a plug-in module
# (loaded at run time, never linked), output name NAME, installed into
# VR_INSTALL_PLUGINDIR with a search path back to the installed libraries.
function(vr_add_plugin NAME)
    cmake_parse_arguments(P "" "" "LIBS" ${ARGN})
    add_library(${NAME} MODULE ${P_UNPARSED_ARGUMENTS})
    set_target_properties(${NAME} PROPERTIES PREFIX "")
    target_link_libraries(${NAME} PRIVATE ${P_LIBS})
    vr_install_rpath(_rpath "${VR_INSTALL_PLUGINDIR}")
    set_target_properties(${NAME} PROPERTIES INSTALL_RPATH "${_rpath}")
    install(TARGETS ${NAME} LIBRARY DESTINATION ${VR_INSTALL_PLUGINDIR})
endfunction()

# The output names of inTarget and of every library of this project that its
# public interface links, in link order (a library before those it needs).
function(_vr_public_libraries inTarget ioList)
    set(_list ${${ioList}})
    get_target_property(_aliased ${inTarget} ALIASED_TARGET)
    if(_aliased)
        set(inTarget ${_aliased})
    endif()
    get_target_property(_name ${inTarget} OUTPUT_NAME)
    list(REMOVE_ITEM _list ${_name})
    list(APPEND _list ${_name})
    get_target_property(_deps ${inTarget} INTERFACE_LINK_LIBRARIES)
    foreach(_dep IN LISTS _deps)
        if(TARGET ${_dep})
            get_target_property(_imported ${_dep} IMPORTED)
            if(NOT _imported)
                _vr_public_libraries(${_dep} _list)
            endif()
        endif()
    endforeach()
    set(${ioList} ${_list} PARENT_SCOPE)
endfunction()

# vr_install_package(): the exported targets, the package configuration and
# version files and the pkg-config file. Called once every library exists.
function(vr_install_package)
    install(EXPORT ${VR_EXPORT_SET}
        NAMESPACE VideoRenderer::
        FILE VideoRendererTargets.cmake
        DESTINATION ${VR_INSTALL_CMAKEDIR})
    configure_package_config_file(
        ${PROJECT_SOURCE_DIR}/cmake/VideoRendererConfig.cmake.in
        ${PROJECT_BINARY_DIR}/VideoRendererConfig.cmake
        INSTALL_DESTINATION ${VR_INSTALL_CMAKEDIR}
        PATH_VARS VR_INSTALL_INCLUDEDIR VR_INSTALL_PLUGINDIR)
    write_basic_package_version_file(
        ${PROJECT_BINARY_DIR}/VideoRendererConfigVersion.cmake
        VERSION ${PROJECT_VERSION}
        COMPATIBILITY SameMinorVersion)
    install(FILES
        ${PROJECT_BINARY_DIR}/VideoRendererConfig.cmake
        ${PROJECT_BINARY_DIR}/VideoRendererConfigVersion.cmake
        DESTINATION ${VR_INSTALL_CMAKEDIR})

    # The pkg-config file finds the prefix from its own place, so that the
    # installed tree may be moved (or installed with cmake --install --prefix).
    if(IS_ABSOLUTE "${VR_INSTALL_PKGCONFIGDIR}")
        set(VR_PC_PREFIX "${CMAKE_INSTALL_PREFIX}")
    else()
        file(RELATIVE_PATH _up "/_root/${VR_INSTALL_PKGCONFIGDIR}" "/_root")
        string(REGEX REPLACE "/$" "" _up "${_up}")
        set(VR_PC_PREFIX "\${pcfiledir}/${_up}")
    endif()
    foreach(_dir LIBDIR INCLUDEDIR)
        if(IS_ABSOLUTE "${CMAKE_INSTALL_${_dir}}")
            set(VR_PC_${_dir} "${CMAKE_INSTALL_${_dir}}")
        else()
            set(VR_PC_${_dir} "\${prefix}/${CMAKE_INSTALL_${_dir}}")
        endif()
    endforeach()
    set(VR_PC_INCLUDEDIR "${VR_PC_INCLUDEDIR}/videorenderer")
    set(_libs "")
    _vr_public_libraries(VideoRenderer _libs)
    list(TRANSFORM _libs PREPEND "-l")
    list(JOIN _libs " " VR_PC_LIBS)
    # Boost's headers are part of the public interface; name their directory
    # when the compiler does not search it anyway.
    set(VR_PC_EXTRA_CFLAGS "")
    foreach(_dir IN LISTS Boost_INCLUDE_DIRS)
        if(NOT _dir IN_LIST CMAKE_CXX_IMPLICIT_INCLUDE_DIRECTORIES)
            string(APPEND VR_PC_EXTRA_CFLAGS " -I${_dir}")
        endif()
    endforeach()
    configure_file(${PROJECT_SOURCE_DIR}/cmake/videorenderer.pc.in
        ${PROJECT_BINARY_DIR}/videorenderer.pc @ONLY)
    install(FILES ${PROJECT_BINARY_DIR}/videorenderer.pc DESTINATION ${VR_INSTALL_PKGCONFIGDIR})
endfunction()
