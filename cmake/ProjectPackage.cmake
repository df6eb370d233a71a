# SPDX-License-Identifier: MIT
#
# find_package(arrayctl) for other programs: arrayctl::nurocore, arrayctl::hwcontrol and
# arrayctl::nurostoragecore. Included when all libraries are there.
include(CMakePackageConfigHelpers)
set(PACKAGE_FOLDER ${CMAKE_INSTALL_LIBDIR}/cmake/arrayctl)
set(PACKAGE_VERSION_FILE "${PROJECT_BINARY_DIR}/arrayctl-config-version.cmake")

# Nothing has to be found first, so the list of the libraries is all that the package consists of.
install(EXPORT arrayctl-libraries FILE arrayctl-config.cmake NAMESPACE arrayctl::
    DESTINATION ${PACKAGE_FOLDER} COMPONENT dev EXCLUDE_FROM_ALL)
write_basic_package_version_file(${PACKAGE_VERSION_FILE} COMPATIBILITY SameMajorVersion)
install(FILES ${PACKAGE_VERSION_FILE}
    DESTINATION ${PACKAGE_FOLDER} COMPONENT dev EXCLUDE_FROM_ALL)
