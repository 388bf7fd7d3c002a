# SPDX-License-Identifier: Apache-2.0
# What of an installation depends on its prefix: the paths inside the units, and the place of the configuration, which
# for /usr is /etc and for a prefix in /opt lies below /etc too. The service looks for it there (HostPaths).
set(prefix "${CMAKE_INSTALL_PREFIX}")
if(prefix STREQUAL "/usr" OR prefix STREQUAL "/")
  set(configuration /etc)
elseif(prefix MATCHES "^/opt/")
  set(configuration "/etc${prefix}")
else()
  set(configuration "${prefix}/etc")
endif()
# An address, in which a unit's own sign for what it fills in is doubled.
string(REPLACE " " "%%20" TARN_DOC_URL "file:${prefix}/${TARN_DOC_DIR}")
foreach(unit tarnreportingd.service tarnreportingd.socket tarnreportingd-admin.socket)
  configure_file("${TARN_PACKAGING}/systemd/${unit}.in" "${TARN_SCRATCH}/${unit}" @ONLY)
  file(INSTALL "${TARN_SCRATCH}/${unit}" DESTINATION "${prefix}/${TARN_UNIT_DIR}")
endforeach()
# A user's own, on the user's own socket and state directory.
configure_file("${TARN_PACKAGING}/systemd/user/tarnreportingd.service.in" "${TARN_SCRATCH}/user/tarnreportingd.service"
  @ONLY)
file(INSTALL "${TARN_SCRATCH}/user/tarnreportingd.service" "${TARN_PACKAGING}/systemd/user/tarnreportingd.socket"
  "${TARN_PACKAGING}/systemd/user/tarnreportingd-admin.socket"
  DESTINATION "${prefix}/${TARN_USER_UNIT_DIR}")
file(INSTALL "${TARN_PACKAGING}/tarnreportingd.toml" DESTINATION "${configuration}/tarnreporting")
if(TARN_EXPORT)
  configure_file("${TARN_PACKAGING}/systemd/tarnreporting-export.service.in"
    "${TARN_SCRATCH}/tarnreporting-export.service" @ONLY)
  file(INSTALL "${TARN_SCRATCH}/tarnreporting-export.service" DESTINATION "${prefix}/${TARN_UNIT_DIR}")
  file(INSTALL "${TARN_PACKAGING}/export.toml" DESTINATION "${configuration}/tarnreporting")
  file(INSTALL "${TARN_PACKAGING}/20-export.toml" DESTINATION "${configuration}/tarnreporting/tarnreportingd.toml.d")
endif()
if(TARN_COLLECT)
  configure_file("${TARN_PACKAGING}/systemd/tarnreporting-collect.service.in"
    "${TARN_SCRATCH}/tarnreporting-collect.service" @ONLY)
  file(INSTALL "${TARN_SCRATCH}/tarnreporting-collect.service" DESTINATION "${prefix}/${TARN_UNIT_DIR}")
  file(INSTALL "${TARN_PACKAGING}/collect.toml" DESTINATION "${configuration}/tarnreporting")
endif()
