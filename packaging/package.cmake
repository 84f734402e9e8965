# What is installed, and the three Debian packages: the program; the reader of its reports, which a desk without any
# host can use; and our library with its sources of nodes, the recorder and the command that tells what a host offers.
# A host that has the library of its own does without the last, so that it never gets ours.

install(TARGETS lan-meter RUNTIME DESTINATION ${CMAKE_INSTALL_SBINDIR} COMPONENT meter)
install(FILES docs/man/lan-meter.8 DESTINATION ${CMAKE_INSTALL_MANDIR}/man8 COMPONENT meter)
install(FILES docs/report.schema.json DESTINATION ${CMAKE_INSTALL_DATADIR}/lan-meter COMPONENT meter)
install(FILES docs/report.md DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT meter)
install(FILES packaging/lan-meter.bash DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions
  RENAME lan-meter COMPONENT meter)
install(FILES packaging/_lan-meter DESTINATION ${CMAKE_INSTALL_DATADIR}/zsh/vendor-completions COMPONENT meter)

install(TARGETS lan-report RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT report)
install(FILES docs/man/lan-report.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT report)
install(FILES packaging/lan-report.bash DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions
  RENAME lan-report COMPONENT report)
install(FILES packaging/_lan-report DESTINATION ${CMAKE_INSTALL_DATADIR}/zsh/vendor-completions COMPONENT report)
install(FILES docs/report.md docs/recipes.md third_party/uplot/LICENSE DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/lan-report
  COMPONENT report)

install(TARGETS corekit LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT corekit)
if(TARGET corekit-tracking)
  install(TARGETS corekit-tracking LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT corekit)
endif()
install(TARGETS knf-record knf-source RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT corekit)
install(FILES docs/man/knf-record.1 docs/man/knf-source.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT corekit)
install(FILES docs/linux.md docs/host-description.md docs/snapshot-format.md
  DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/lan-meter-corekit COMPONENT corekit)
install(DIRECTORY docs/examples DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/lan-meter-corekit COMPONENT corekit)

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_VENDOR "lan-meter maintainers")
set(CPACK_PACKAGE_CONTACT "lan-meter maintainers <maintainers@localhost>")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_COMPONENTS_ALL meter report corekit)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_METER_PACKAGE_NAME lan-meter)
set(CPACK_DEBIAN_METER_PACKAGE_SECTION net)
set(CPACK_DEBIAN_METER_PACKAGE_DEPENDS "libc6 (>= 2.36)")
set(CPACK_DEBIAN_METER_PACKAGE_SUGGESTS "lan-meter-corekit, lan-report")
set(CPACK_COMPONENT_METER_DESCRIPTION "Network statistics of a hypervisor host's virtual switches
 Reports packet, byte and error rates of switch ports, and what stands behind
 each port, as one JSON document. Needs the host's libcorekit.so.")
set(CPACK_DEBIAN_REPORT_PACKAGE_NAME lan-report)
set(CPACK_DEBIAN_REPORT_PACKAGE_SECTION net)
set(CPACK_DEBIAN_REPORT_PACKAGE_DEPENDS
  "libc6 (>= 2.36), libstdc++6 (>= 12), libgcc-s1, libsimdjson14 (>= 3.0), zlib1g")
set(CPACK_DEBIAN_REPORT_PACKAGE_SUGGESTS "lan-meter")
set(CPACK_COMPONENT_REPORT_DESCRIPTION "records, tables, findings and pages from reports of lan-meter
 Cuts endless reports into records, mends names, shows tables and what is
 wrong, and makes one self-contained page to look at. Needs no host.")
set(CPACK_DEBIAN_COREKIT_PACKAGE_NAME lan-meter-corekit)
set(CPACK_DEBIAN_COREKIT_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_COREKIT_PACKAGE_DEPENDS "libc6 (>= 2.36), libstdc++6 (>= 12), libgcc-s1")
set(CPACK_COMPONENT_COREKIT_DESCRIPTION "libcorekit.so for Linux hosts, its recorder and a command that tells its worth
 Reads bridges, NICs, KVM guests and the IP stack of a Linux host, plays a
 simulated one, and records and serves snapshots. Not for a host that has a
 libcorekit.so of its own.")
include(CPack)
