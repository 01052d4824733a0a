# `cpack` makes a Debian package of a release build. What differs from `cmake --install` (see
# stage.cmake) is put in order in CPack's own copy of the installation.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_CONTACT "vornreport maintainers <maintainers@vornreport.example>")
set(CPACK_SET_DESTDIR ON)
set(CPACK_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_PRE_BUILD_SCRIPTS ${CMAKE_CURRENT_LIST_DIR}/stage.cmake)

set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_COMPRESSION_TYPE xz)
set(CPACK_DEBIAN_PACKAGE_SECTION admin)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_RECOMMENDS "quota, cron | systemd-sysv")
set(CPACK_DEBIAN_PACKAGE_SUGGESTS "default-mta | mail-transport-agent, samba-common-bin")
set(CPACK_DEBIAN_PACKAGE_DESCRIPTION
"vornreport walks the shares of a file server, measures its volumes, reads its
quotas, and writes what it finds as one HTML page and CSV files: usage and
forecast of volumes, sizes of shares, owners, types of files, duplicates, the
largest, oldest and newest files, quotas. It runs from a timer or from cron,
moves each report into a dated folder, and mails a link to it.")
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${CMAKE_CURRENT_LIST_DIR}/postinst
  ${CMAKE_CURRENT_LIST_DIR}/prerm ${CMAKE_CURRENT_LIST_DIR}/postrm)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)

include(CPack)
