# The Debian packages: cpack --preset release. vrxagent is what a device gets; libvrxagent-client0.1 is what applications
# there are linked with, and libvrxagent-client-dev what they are built from; vrx-coverage-server is for who develops and
# tests.
file(STRINGS debian/changelog latest LIMIT_COUNT 1)
if(NOT latest MATCHES "^vrxagent \\(${CMAKE_PROJECT_VERSION}\\) ")
    message(FATAL_ERROR "packaging/debian/changelog does not begin with version ${CMAKE_PROJECT_VERSION}: ${latest}")
endif()
set(changelog ${CMAKE_CURRENT_BINARY_DIR}/changelog.gz)
add_custom_command(OUTPUT ${changelog} VERBATIM DEPENDS debian/changelog
    COMMAND gzip -9n < ${CMAKE_CURRENT_SOURCE_DIR}/debian/changelog > ${changelog})
add_custom_target(debian_changelog ALL DEPENDS ${changelog})
set(library libvrxagent-client${abi})
install(FILES debian/copyright ${changelog} DESTINATION share/doc/vrxagent)
install(FILES debian/copyright ${changelog} DESTINATION share/doc/vrx-coverage-server COMPONENT server)
install(FILES debian/copyright ${changelog} DESTINATION share/doc/${library} COMPONENT library)
install(FILES debian/copyright ${changelog} DESTINATION share/doc/libvrxagent-client-dev COMPONENT dev)

set(CPACK_GENERATOR DEB)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_ALL agent library dev server)
if(VRX_SETTINGS)
    install(FILES debian/copyright ${changelog} DESTINATION share/doc/vrxagent-settings COMPONENT settings)
    list(APPEND CPACK_COMPONENTS_ALL settings)
endif()
set(CPACK_COMPONENTS_GROUPING IGNORE)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS
    OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)

set(CPACK_PACKAGE_CONTACT "The vrxagent authors <vrxagent@orvane.example>")
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_COMPRESSION_TYPE xz)

set(CPACK_DEBIAN_AGENT_PACKAGE_NAME vrxagent)
set(CPACK_DEBIAN_AGENT_PACKAGE_SECTION utils)
set(CPACK_COMPONENT_AGENT_DESCRIPTION "keeps track of the hardware coverage of a device
A background agent that fetches the coverage records of this device and of the
watches paired with it, keeps them, answers entitled applications over a Unix
socket, and has the settings application show what a user may want to do.
.
Contains the agent, and the tools vrxctl and vrxhost.")
# The libraries that are opened only when they are needed, whom no program names; the rest dpkg-shlibdeps finds.
string(REGEX MATCH "^[0-9]+" icu_version "${ICU_icu-uc_VERSION}")
string(JOIN ", " CPACK_DEBIAN_AGENT_PACKAGE_DEPENDS
    "libcurl4"
    "libexpat1"
    "libicu${icu_version}"
    "systemd | systemd-standalone-sysusers | systemd-sysusers")  # for the postinst
set(CPACK_DEBIAN_AGENT_PACKAGE_RECOMMENDS "ca-certificates")
string(JOIN ", " CPACK_DEBIAN_AGENT_PACKAGE_SUGGESTS
    "dbus, polkitd, network-manager-config-connectivity-debian"  # to know the machine
    "libvrxagent-client-dev"  # to build applications
    "vrx-coverage-server")     # to test
foreach(script postinst prerm postrm)
    list(APPEND CPACK_DEBIAN_AGENT_PACKAGE_CONTROL_EXTRA ${CMAKE_CURRENT_SOURCE_DIR}/debian/${script})
endforeach()

set(CPACK_DEBIAN_LIBRARY_PACKAGE_NAME ${library})
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SOURCE vrxagent)
set(CPACK_COMPONENT_LIBRARY_DESCRIPTION "lets applications ask vrxagent for hardware coverage
The client library of vrxagent, with which applications show the coverage of
this device and of the watches paired with it.")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_RECOMMENDS "libicu${icu_version}")  # opened when it is needed
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SUGGESTS "vrxagent")
# What is linked with it depends on its package; the linker's cache is renewed with it.
set(control ${CMAKE_CURRENT_BINARY_DIR}/client)
file(WRITE ${control}/shlibs "libvrxagent-client ${abi} ${library} (>= ${PROJECT_VERSION})\n")
file(WRITE ${control}/triggers "activate-noawait ldconfig\n")
# The scripts do not exist: naming them keeps CPack from its own, which call ldconfig, and that outside of a root.
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA
    ${control}/shlibs ${control}/triggers ${control}/none/postinst ${control}/none/postrm)

set(CPACK_DEBIAN_DEV_PACKAGE_NAME libvrxagent-client-dev)
set(CPACK_DEBIAN_DEV_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEV_PACKAGE_SOURCE vrxagent)
set(CPACK_DEBIAN_DEV_PACKAGE_DEPENDS "${library} (= ${PROJECT_VERSION}), libsystemd-dev")  # the archive needs the latter
set(CPACK_COMPONENT_DEV_DESCRIPTION "lets applications ask vrxagent for hardware coverage (development)
The headers of vrxagent's client library, its archive, and what tells CMake
and pkg-config about them. An example is among the documents of vrxagent.")

set(CPACK_DEBIAN_SERVER_PACKAGE_NAME vrx-coverage-server)
set(CPACK_DEBIAN_SERVER_PACKAGE_SECTION devel)
set(CPACK_DEBIAN_SERVER_PACKAGE_SOURCE vrxagent)
set(CPACK_DEBIAN_SERVER_PACKAGE_DEPENDS "libcurl4, libexpat1, libicu${icu_version}")  # opened when they are needed
set(CPACK_COMPONENT_SERVER_DESCRIPTION "coverage server for the development of vrxagent
Serves coverage records on loopback, judges the requests that vrxagent makes
for them, shows them, and misbehaves as it is told to. Checks what other
servers answer, too, as vrxagent would read it.")

set(CPACK_DEBIAN_SETTINGS_PACKAGE_NAME vrxagent-settings)
set(CPACK_DEBIAN_SETTINGS_PACKAGE_SECTION gnome)
set(CPACK_DEBIAN_SETTINGS_PACKAGE_SOURCE vrxagent)
set(CPACK_DEBIAN_SETTINGS_PACKAGE_DEPENDS "vrxagent (= ${CMAKE_PROJECT_VERSION}), adwaita-icon-theme")
set(CPACK_COMPONENT_SETTINGS_DESCRIPTION "page that shows the hardware coverage of a device
Shows the coverage of this device and of the watches paired with it, and the
offers to extend it, as vrxagent knows them.
.
Contains a notifier of such offers, too, which a user may enable.")

include(CPack)
