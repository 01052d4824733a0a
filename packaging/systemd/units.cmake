# systemd's units: a service and a timer for each of the two actions that are run by the clock.
set(units ${CMAKE_CURRENT_LIST_DIR})

set(UNIT_WORD report)
# The program's exit status is 0 in any case; the unit's shall tell how the run went.
set(UNIT_OUTCOME [[ExecStartPost=/bin/sh -c 'read -r word <"$1" && [ "$word" = success ]' sh /usr/vorn/var/status/%i]])
set(UNIT_MORE ", and to ask for the quotas of all users")
set(UNIT_CAPABILITIES "CAP_DAC_READ_SEARCH CAP_SYS_ADMIN")
configure_file(${units}/vornreport.service.in ${CMAKE_BINARY_DIR}/systemd/vornreport@.service @ONLY)

set(UNIT_WORD data)
set(UNIT_OUTCOME "")
set(UNIT_MORE "")
set(UNIT_CAPABILITIES CAP_DAC_READ_SEARCH)
configure_file(${units}/vornreport.service.in
  ${CMAKE_BINARY_DIR}/systemd/vornreport-data@.service @ONLY)

install(FILES ${CMAKE_BINARY_DIR}/systemd/vornreport@.service
  ${CMAKE_BINARY_DIR}/systemd/vornreport-data@.service
  ${units}/vornreport@.timer ${units}/vornreport-data@.timer
  DESTINATION /usr/lib/systemd/system)
