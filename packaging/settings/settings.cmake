# What the package of the settings page consists of. Its programs have a folder to themselves: the bundle.toml in it
# entitles all that lies beside it.
set(settings_folder lib/vrxagent-settings)
install(TARGETS vrx-settings vrx-settings-notify DESTINATION ${settings_folder} COMPONENT settings)
install(FILES ${CMAKE_SOURCE_DIR}/apps/settings/bundle.toml DESTINATION ${settings_folder} COMPONENT settings)
set(link ${CMAKE_CURRENT_BINARY_DIR}/vrx-settings)
file(CREATE_LINK ../${settings_folder}/vrx-settings ${link} SYMBOLIC)
install(FILES ${link} DESTINATION bin COMPONENT settings)
install(DIRECTORY ${CMAKE_BINARY_DIR}/bin/settings/locale DESTINATION share COMPONENT settings)

set(id com.orvane.Coverage)
install(FILES settings/${id}.desktop DESTINATION share/applications COMPONENT settings)
install(FILES settings/${id}.metainfo.xml DESTINATION share/metainfo COMPONENT settings)
install(FILES settings/${id}.svg DESTINATION share/icons/hicolor/scalable/apps COMPONENT settings)
install(FILES settings/${id}.service DESTINATION share/dbus-1/services COMPONENT settings)
install(FILES systemd/user/vrx-settings-notify.service DESTINATION lib/systemd/user COMPONENT settings)
