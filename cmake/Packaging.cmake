# Debian packages, made by scripts/package: kelvo, the command and its pages,
# and kelvo-dev, for programs that write trace files.

# The default names nobody, at an address that no mail reaches. Who gives
# packages to others sets it to a name and address of their own:
#   scripts/package -DKELVO_PACKAGE_CONTACT='Name <address>'
set(KELVO_PACKAGE_CONTACT "kelvo developers <kelvo@kelvo.invalid>"
    CACHE STRING "Maintainer named in packages, as Name <address>")

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME kelvo)
set(CPACK_PACKAGE_CONTACT ${KELVO_PACKAGE_CONTACT})
# Each package has its own: the first line of its description.
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "")
set(CPACK_COMPONENTS_ALL runtime dev)
set(CPACK_STRIP_FILES ON)

set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SOURCE kelvo)
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)

set(CPACK_DEBIAN_RUNTIME_PACKAGE_NAME kelvo)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_RUNTIME_DESCRIPTION
    "print binary trace files as text
A tracing library writes records into trace files, rings that are mapped into
the memory of the traced program. kelvo prints the records of one or many such
files as one stream in the order of their times, by format strings from
template files, and can follow the files while they grow.")

set(CPACK_DEBIAN_DEV_PACKAGE_NAME kelvo-dev)
set(CPACK_DEBIAN_DEV_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEV_PACKAGE_DEPENDS libc6-dev)
set(CPACK_DEBIAN_DEV_PACKAGE_RECOMMENDS kelvo)
set(CPACK_DEBIAN_DEV_DESCRIPTION
    "write trace files for kelvo
Headers and static libraries for C++ programs that write trace files, which
kelvo prints as text: the writer of the ring with its reader protocol, and the
format of the files.")

# What Debian asks of a package's files is done to the staged tree.
set(CPACK_PRE_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/cmake/debian_files.cmake)
set(CPACK_KELVO_LICENSE ${PROJECT_SOURCE_DIR}/LICENSE)

include(CPack)
