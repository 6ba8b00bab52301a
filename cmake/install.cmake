# What an image gets: the tools, their manuals, the unit, the documents, the examples.
include(GNUInstallDirs)
set(KESTREL_UNIT_DIR lib/systemd/system CACHE STRING
  "The directory of the systemd unit, relative to the prefix unless absolute")

configure_file(man/kestrel.8.in man/kestrel.8 @ONLY)
configure_file(man/kestrelctl.8.in man/kestrelctl.8 @ONLY)
configure_file(systemd/kestrel.service.in systemd/kestrel.service @ONLY)

install(TARGETS kestrel kestrelctl DESTINATION ${CMAKE_INSTALL_SBINDIR})
install(FILES ${PROJECT_BINARY_DIR}/man/kestrel.8 ${PROJECT_BINARY_DIR}/man/kestrelctl.8
  DESTINATION ${CMAKE_INSTALL_MANDIR}/man8)
install(FILES ${PROJECT_BINARY_DIR}/systemd/kestrel.service DESTINATION ${KESTREL_UNIT_DIR})
install(FILES README.md CHANGELOG.md LICENSE TYPE DOC)
install(DIRECTORY docs TYPE DOC)
install(DIRECTORY examples TYPE DOC USE_SOURCE_PERMISSIONS)
