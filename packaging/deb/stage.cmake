# Run by cpack on its copy of the installation, before the package is made of it.
set(root ${CPACK_TEMPORARY_INSTALL_DIRECTORY})
set(doc ${root}/usr/share/doc/vornreport)

# The configuration is no conffile: vornctl edits it, and an upgrade must not ask about that.
# postinst makes it of these.
file(MAKE_DIRECTORY ${root}/usr/share/vornreport)
foreach(name vornreport.conf share.conf)
  file(RENAME ${root}/usr/vorn/etc/${name} ${root}/usr/share/vornreport/${name})
endforeach()

file(COPY ${CMAKE_CURRENT_LIST_DIR}/copyright ${CMAKE_CURRENT_LIST_DIR}/changelog
  DESTINATION ${doc})
file(COPY ${CMAKE_CURRENT_LIST_DIR}/lintian-overrides
  DESTINATION ${root}/usr/share/lintian/overrides)
file(RENAME ${root}/usr/share/lintian/overrides/lintian-overrides
  ${root}/usr/share/lintian/overrides/vornreport)
file(GLOB pages ${root}/usr/share/man/man?/*.[1-9])
execute_process(COMMAND gzip -9 -n ${doc}/changelog ${pages} COMMAND_ERROR_IS_FATAL ANY)
# Whatever the umask of whoever builds it.
execute_process(COMMAND chmod -R u=rwX,go=rX ${root} COMMAND_ERROR_IS_FATAL ANY)
