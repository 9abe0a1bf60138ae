# The client library as applications find it: an archive, for programs; the same as a shared library, for programs and
# plug-ins; the public headers, and what tells CMake and pkg-config about all that.
set(layers client wire codec_core records platform)
set(libraries lib/${CMAKE_LIBRARY_ARCHITECTURE})

add_library(vrxagent_client STATIC)
add_library(vrxagent_client_shared SHARED)
# Its sources are compiled for it, because objects for programs go into programs only, and are the faster ones there.
foreach(layer ${layers})
    target_sources(vrxagent_client PRIVATE $<TARGET_OBJECTS:vrx_${layer}>)
    get_target_property(sources vrx_${layer} SOURCES)
    target_sources(vrxagent_client_shared PRIVATE ${sources})
    set_source_files_properties(${sources} PROPERTIES UNITY_GROUP ${layer})  # layers may have names in common
endforeach()
set_target_properties(vrxagent_client PROPERTIES OUTPUT_NAME vrxagent-client EXPORT_NAME client LINKER_LANGUAGE CXX)
# Before 1.0, a minor version may change what applications were built with. What is not VRX_CLIENT_API is hidden, and so
# are, by the script, the instantiations of the standard library's templates. What is shown is called directly within:
# a program around it may have the same names.
set(abi ${PROJECT_VERSION_MAJOR}.${PROJECT_VERSION_MINOR})
set(exports ${CMAKE_CURRENT_SOURCE_DIR}/client/exports.map)
set_target_properties(vrxagent_client_shared PROPERTIES
    OUTPUT_NAME vrxagent-client EXPORT_NAME client-shared VERSION ${PROJECT_VERSION} SOVERSION ${abi}
    CXX_VISIBILITY_PRESET hidden VISIBILITY_INLINES_HIDDEN ON UNITY_BUILD_MODE GROUP LINK_DEPENDS ${exports})
target_compile_options(vrxagent_client_shared PRIVATE -fPIC)  # the programs are not
target_include_directories(vrxagent_client_shared PRIVATE $<TARGET_PROPERTY:vrx_client,INCLUDE_DIRECTORIES>)
target_link_libraries(vrxagent_client_shared PRIVATE PkgConfig::SYSTEMD Threads::Threads ${CMAKE_DL_LIBS})
target_link_options(vrxagent_client_shared PRIVATE LINKER:--version-script=${exports} LINKER:-z,defs LINKER:-Bsymbolic)

target_link_libraries(vrxagent_client INTERFACE systemd Threads::Threads ${CMAKE_DL_LIBS})
foreach(target vrxagent_client vrxagent_client_shared)
    target_compile_features(${target} INTERFACE cxx_std_20)
    target_include_directories(${target} INTERFACE $<INSTALL_INTERFACE:include>)
endforeach()
if(CMAKE_STRIP)
    add_custom_command(TARGET vrxagent_client POST_BUILD VERBATIM
        COMMAND ${CMAKE_STRIP} --strip-debug --remove-section=.comment --enable-deterministic-archives $<TARGET_FILE:vrxagent_client>)
endif()

# What applications may include: the classes that they call, and what those are made of.
foreach(header
    client/agent_connection.h client/answer.h client/changes.h client/follow_ups.h client/surroundings.h
    coverage/records/warranty.h devices/records/device.h devices/records/device_info.h
    platform/api.h platform/archivable.h platform/date.h platform/property.h platform/value.h
    protocols/forward.h)
    get_filename_component(header_folder ${header} DIRECTORY)
    install(FILES ${CMAKE_SOURCE_DIR}/src/${header} DESTINATION include/vrx/${header_folder} COMPONENT dev)
endforeach()

set(cmake_files ${libraries}/cmake/vrxagent-client)
install(TARGETS vrxagent_client EXPORT vrxagent_client DESTINATION ${libraries} COMPONENT dev)
install(TARGETS vrxagent_client_shared EXPORT vrxagent_client
    LIBRARY DESTINATION ${libraries} COMPONENT library NAMELINK_COMPONENT dev)
install(EXPORT vrxagent_client FILE vrxagent-client-targets.cmake NAMESPACE vrxagent:: DESTINATION ${cmake_files}
    COMPONENT dev)

include(CMakePackageConfigHelpers)
set(version_file ${CMAKE_CURRENT_BINARY_DIR}/client/vrxagent-client-config-version.cmake)
write_basic_package_version_file(${version_file} COMPATIBILITY SameMinorVersion)
install(FILES client/vrxagent-client-config.cmake ${version_file} DESTINATION ${cmake_files} COMPONENT dev)

# One for each of the two, because a linker that is offered both takes the shared one.
file(RELATIVE_PATH prefix_from_pkg_config /${libraries}/pkgconfig /)
foreach(name vrxagent-client vrxagent-client-static)
    set(pkg_config_file ${CMAKE_CURRENT_BINARY_DIR}/client/${name}.pc)
    configure_file(client/${name}.pc.in ${pkg_config_file} @ONLY)
    install(FILES ${pkg_config_file} DESTINATION ${libraries}/pkgconfig COMPONENT dev)
endforeach()
