# SPDX-License-Identifier: Apache-2.0
# What `cmake --install` puts where. One component for each package that a distribution may want to
# ship apart: helper, client, client-development, halvecctl, handset.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

set(HALVEC_UNIT_DIRECTORY "${CMAKE_INSTALL_PREFIX}/lib/systemd/system" CACHE STRING
    "Directory of the service launcher's units")
set(HALVEC_HELPER_USER "halvec-helper" CACHE STRING "User that the helper runs as")
set(HALVEC_PORTS_GROUP "halvec" CACHE STRING "Group that may send to the service port")

set(HALVEC_HELPER_FILE "${CMAKE_INSTALL_FULL_LIBEXECDIR}/halvec/HalvecMobileHelper")
cmake_path(GET HALVEC_TOKEN_STORE PARENT_PATH HALVEC_STATE_DIRECTORY)
cmake_path(GET HALVEC_PORTS_DIRECTORY PARENT_PATH HALVEC_RUN_DIRECTORY)
string(REPLACE ":" ";" HALVEC_ENTITLEMENT_LIST "${HALVEC_ENTITLEMENT_DIRECTORIES}")
list(GET HALVEC_ENTITLEMENT_LIST -1 HALVEC_SHARED_ENTITLEMENTS)

# halvec_install_configured(SOURCE DESTINATION COMPONENT): a file with the deployment's names in it.
function(halvec_install_configured source destination component)
  set(configured ${PROJECT_BINARY_DIR}/Packaging/${source})
  configure_file(${PROJECT_SOURCE_DIR}/Packaging/${source}.in ${configured} @ONLY)
  install(FILES ${configured} DESTINATION ${destination} COMPONENT ${component})
endfunction()

# halvec_install_documents(COMPONENT PAGE ...): the manual pages of a component.
function(halvec_install_documents component)
  foreach(page IN LISTS ARGN)
    string(REGEX MATCH "[0-9]$" section ${page})
    install(FILES ${PROJECT_SOURCE_DIR}/Documentation/man/${page}
            DESTINATION ${CMAKE_INSTALL_MANDIR}/man${section} COMPONENT ${component})
  endforeach()
endfunction()

# The helper: its program, the launcher's units, its user and folders.
install(TARGETS HalvecMobileHelper DESTINATION ${CMAKE_INSTALL_LIBEXECDIR}/halvec COMPONENT helper)
foreach(unit IN ITEMS halvec-mobile-helper.socket halvec-mobile-helper.service)
  halvec_install_configured(systemd/${unit} ${HALVEC_UNIT_DIRECTORY} helper)
endforeach()
halvec_install_configured(systemd/sysusers.d/halvec-mobile-helper.conf
                          ${CMAKE_INSTALL_PREFIX}/lib/sysusers.d helper)
halvec_install_configured(systemd/tmpfiles.d/halvec-mobile-helper.conf
                          ${CMAKE_INSTALL_PREFIX}/lib/tmpfiles.d helper)
halvec_install_configured(openrc/halvec-mobile-helper.initd
                          ${CMAKE_INSTALL_DATADIR}/doc/halvec-mobile-helper/examples helper)
foreach(directory IN LISTS HALVEC_ENTITLEMENT_LIST)
  install(DIRECTORY DESTINATION ${directory} COMPONENT helper)
endforeach()

halvec_install_documents(helper halvec-mobile-helper.8 halvec-entitlements.5 halvec-transport.7)

# The client library, for who runs with it and for who builds with it.
install(TARGETS HelperClientShared
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT client
        NAMELINK_COMPONENT client-development)
install(TARGETS HelperClient
        ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT client-development)
install(FILES Client/halvec_mobile_helper.h DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
        COMPONENT client-development)
# The C++ headers name one another from the root of this tree, so they keep a root of their own.
set(HALVEC_CXX_INCLUDEDIR ${CMAKE_INSTALL_INCLUDEDIR}/halvec-mobile-helper)
foreach(header IN ITEMS
    Client/Data.h Client/HelperClient.h Client/RequestEncoding.h Client/Result.h
    Client/ServiceConnection.h Client/halvec_mobile_helper.h Helper/Platform/FileDescriptor.h
    Helper/Shared/Interface/Message.h Helper/Shared/Interface/Request.h
    Helper/Shared/Interface/Requests.h Helper/Shared/Interface/ReturnCodes.h)
  cmake_path(GET header PARENT_PATH folder)
  install(FILES ${header} DESTINATION ${HALVEC_CXX_INCLUDEDIR}/${folder}
          COMPONENT client-development)
endforeach()
halvec_install_configured(client/halvec-mobile-helper.pc ${CMAKE_INSTALL_LIBDIR}/pkgconfig
                          client-development)
get_target_property(HALVEC_CLIENT_ABI HelperClientShared SOVERSION)
get_target_property(HALVEC_CLIENT_VERSION HelperClientShared VERSION)
set(HALVEC_CONFIG_DIRECTORY ${CMAKE_INSTALL_LIBDIR}/cmake/HalvecMobileHelper)
configure_package_config_file(
  Packaging/client/HalvecMobileHelperConfig.cmake.in
  ${PROJECT_BINARY_DIR}/Packaging/HalvecMobileHelperConfig.cmake
  INSTALL_DESTINATION ${HALVEC_CONFIG_DIRECTORY}
  PATH_VARS CMAKE_INSTALL_INCLUDEDIR CMAKE_INSTALL_LIBDIR HALVEC_CXX_INCLUDEDIR
  NO_CHECK_REQUIRED_COMPONENTS_MACRO)
write_basic_package_version_file(
  ${PROJECT_BINARY_DIR}/Packaging/HalvecMobileHelperConfigVersion.cmake
  COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/Packaging/HalvecMobileHelperConfig.cmake
              ${PROJECT_BINARY_DIR}/Packaging/HalvecMobileHelperConfigVersion.cmake
        DESTINATION ${HALVEC_CONFIG_DIRECTORY} COMPONENT client-development)

# The command line, entitled where root runs it, and the simulated handset.
install(TARGETS halvecctl DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT halvecctl)
halvec_install_configured(halvecctl.plist ${HALVEC_SHARED_ENTITLEMENTS} halvecctl)
install(TARGETS handset DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT handset)
foreach(tool IN ITEMS halvecctl handset)
  install(FILES Packaging/completion/${tool}
          DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions COMPONENT ${tool})
endforeach()
halvec_install_documents(halvecctl halvecctl.1)
halvec_install_documents(handset handset.1)
