# SPDX-License-Identifier: Apache-2.0
# Two Debian packages, made by scripts/package: kestmodem-tools has the workstation's part, that
# is, all that is installed without a component of its own; kestmodem has the service with a
# systemd unit, and the simulated handset.
install(FILES packaging/kestmodem.service DESTINATION lib/systemd/system
    COMPONENT service EXCLUDE_FROM_ALL)
install(FILES packaging/kest_modem.conf packaging/default.prop DESTINATION /etc/kestmodem
    COMPONENT service EXCLUDE_FROM_ALL)
install(FILES packaging/copyright DESTINATION share/doc/kestmodem
    COMPONENT service EXCLUDE_FROM_ALL)
install(FILES packaging/copyright DESTINATION share/doc/kestmodem-tools
    COMPONENT tools EXCLUDE_FROM_ALL)

set(CPACK_GENERATOR DEB)
set(CPACK_COMPONENTS_ALL tools service)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE
    GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
set(CPACK_PRE_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/packaging/finish.cmake)
set(CPACK_PACKAGE_CONTACT "kestmodem maintainers <maintainers@kestmodem.example>")

set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SOURCE kestmodem)
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)

set(CPACK_DEBIAN_TOOLS_PACKAGE_NAME kestmodem-tools)
set(CPACK_DEBIAN_TOOLS_PACKAGE_SECTION utils)
set(CPACK_COMPONENT_TOOLS_DESCRIPTION "control kestmodem and read the logs that it collects
kestctl sends requests to the log collector of a handset, kestlog reads the log
trees that it writes: lists, checks and takes them apart.")

set(CPACK_DEBIAN_SERVICE_PACKAGE_NAME kestmodem)
set(CPACK_DEBIAN_SERVICE_PACKAGE_SECTION admin)
set(CPACK_DEBIAN_SERVICE_PACKAGE_RECOMMENDS kestmodem-tools)
set(CPACK_DEBIAN_SERVICE_PACKAGE_CONTROL_EXTRA
    ${PROJECT_SOURCE_DIR}/packaging/postinst
    ${PROJECT_SOURCE_DIR}/packaging/prerm
    ${PROJECT_SOURCE_DIR}/packaging/postrm
    ${PROJECT_SOURCE_DIR}/packaging/conffiles)
set(CPACK_DEBIAN_SERVICE_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_COMPONENT_SERVICE_DESCRIPTION "collector of the device logs of a handset's co-processors
kestmodem copies the log streams of a modem and other co-processors into
rotating files within a quota, saves crash material and is controlled through
a local socket. kestsim is a simulated handset for it: a demo, the replay of
recorded logs, and a service for authors of control clients to talk to.")
include(CPack)
