# The client library: what an application needs that reaches the services of a drive's items. Installed as the
# component "client": headers, archives, and the package file for find_package(Droxa).
include(CMakePackageConfigHelpers)

set(DROXA_CLIENT_LIBRARIES
  droxa_tessaly droxa_tessaly_xpc droxa_tessaly_schemas droxa_xpc droxa_xpc_schemas droxa_platform)
set(DROXA_CLIENT_INCLUDES ${CMAKE_INSTALL_INCLUDEDIR}/droxa)
set(DROXA_CLIENT_ARCHIVES ${CMAKE_INSTALL_LIBDIR}/droxa)
set(client_package ${CMAKE_INSTALL_LIBDIR}/cmake/Droxa)

install(TARGETS ${DROXA_CLIENT_LIBRARIES} ARCHIVE DESTINATION ${DROXA_CLIENT_ARCHIVES} COMPONENT client)
# Adapters' and implementations' own headers stay behind: they name the libraries beneath.
install(DIRECTORY platform tessaly DESTINATION ${DROXA_CLIENT_INCLUDES} COMPONENT client
  FILES_MATCHING PATTERN "*.h"
  PATTERN "platform/xpc/capnp" EXCLUDE PATTERN "platform/cloudkit/embedded" EXCLUDE
  PATTERN "*Adapter.h" EXCLUDE PATTERN "tessaly/xpc/QVProtocol*" EXCLUDE PATTERN "tessaly/xpc/QVPassed*" EXCLUDE
  PATTERN "tessaly/xpc/QVShare*" EXCLUDE PATTERN "tessaly/xpc/*Values.h" EXCLUDE)

configure_package_config_file(cmake/DroxaConfig.cmake.in ${CMAKE_BINARY_DIR}/DroxaConfig.cmake
  INSTALL_DESTINATION ${client_package} PATH_VARS DROXA_CLIENT_INCLUDES DROXA_CLIENT_ARCHIVES)
write_basic_package_version_file(${CMAKE_BINARY_DIR}/DroxaConfigVersion.cmake COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_BINARY_DIR}/DroxaConfig.cmake ${CMAKE_BINARY_DIR}/DroxaConfigVersion.cmake
  DESTINATION ${client_package} COMPONENT client)
