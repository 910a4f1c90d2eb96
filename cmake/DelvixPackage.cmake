# The Debian package: the install tree under /usr, dependencies found by dpkg-shlibdeps,
# no maintainer scripts (the desktop's triggers index the entry, icons and man pages).
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME delvix)
set(CPACK_PACKAGE_VENDOR Norvale)
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "Explore Zantro handsets and simulators")
set(CPACK_PACKAGE_DESCRIPTION
    "Delvix lists the Zantro handsets and simulators the device gateway reaches and shows what a device holds on ten pages; delvix-cli gives the same data to scripts, and zantro-sim serves a device image as a handset would.")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_MAINTAINER "Norvale <delvix@norvale.example>")
set(CPACK_DEBIAN_PACKAGE_SECTION devel)
set(CPACK_DEBIAN_PACKAGE_HOMEPAGE https://norvale.example/delvix)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
include(CPack)
