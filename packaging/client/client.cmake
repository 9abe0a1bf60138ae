# The client library as applications find it: one archive of the layers that it stands on, the headers that its own one
# includes, and what tells CMake and pkg-config about it.
add_library(vrxagent_client STATIC $<TARGET_OBJECTS:vrx_client> $<TARGET_OBJECTS:vrx_wire> $<TARGET_OBJECTS:vrx_codec_core>
    $<TARGET_OBJECTS:vrx_records> $<TARGET_OBJECTS:vrx_platform>)
set_target_properties(vrxagent_client PROPERTIES OUTPUT_NAME vrxagent-client EXPORT_NAME client LINKER_LANGUAGE CXX)
target_compile_features(vrxagent_client INTERFACE cxx_std_20)
target_include_directories(vrxagent_client INTERFACE $<INSTALL_INTERFACE:include>)
target_link_libraries(vrxagent_client INTERFACE systemd Threads::Threads ${CMAKE_DL_LIBS})
if(CMAKE_STRIP)
    add_custom_command(TARGET vrxagent_client POST_BUILD VERBATIM
        COMMAND ${CMAKE_STRIP} --strip-debug --remove-section=.comment --enable-deterministic-archives $<TARGET_FILE:vrxagent_client>)
endif()

# The header, and all that those include which are included already.
set(headers client/agent_connection.h)
set(unread ${headers})
while(unread)
    list(POP_FRONT unread header)
    file(STRINGS ${CMAKE_SOURCE_DIR}/src/${header} lines REGEX "^#include \"vrx/")
    list(TRANSFORM lines REPLACE "^#include \"vrx/(.*)\".*" "\\1")
    list(REMOVE_ITEM lines "" ${headers})
    list(APPEND headers ${lines})
    list(APPEND unread ${lines})
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${CMAKE_SOURCE_DIR}/src/${header})
endwhile()
foreach(header ${headers})
    get_filename_component(header_folder ${header} DIRECTORY)
    install(FILES ${CMAKE_SOURCE_DIR}/src/${header} DESTINATION include/vrx/${header_folder})
endforeach()

set(libraries lib/${CMAKE_LIBRARY_ARCHITECTURE})
set(cmake_files ${libraries}/cmake/vrxagent-client)
install(TARGETS vrxagent_client EXPORT vrxagent_client DESTINATION ${libraries})
install(EXPORT vrxagent_client FILE vrxagent-client-targets.cmake NAMESPACE vrxagent:: DESTINATION ${cmake_files})

include(CMakePackageConfigHelpers)
set(version_file ${CMAKE_CURRENT_BINARY_DIR}/client/vrxagent-client-config-version.cmake)
write_basic_package_version_file(${version_file} COMPATIBILITY SameMinorVersion)
install(FILES client/vrxagent-client-config.cmake ${version_file} DESTINATION ${cmake_files})

set(pkg_config_file ${CMAKE_CURRENT_BINARY_DIR}/client/vrxagent-client.pc)
file(RELATIVE_PATH prefix_from_pkg_config /${libraries}/pkgconfig /)
configure_file(client/vrxagent-client.pc.in ${pkg_config_file} @ONLY)
install(FILES ${pkg_config_file} DESTINATION ${libraries}/pkgconfig)
