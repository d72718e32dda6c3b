# The packages, each as .tar.gz, .deb and .rpm: wzorinst; zorctl for those who run machines; spb for
# those who make SPBs; and the debug symbols. Of the system they need nothing but a C library.
# Same files, same bytes: all times are that of the release, or SOURCE_DATE_EPOCH.
set(CPACK_GENERATOR TGZ DEB)
find_program(RPMBUILD rpmbuild)
if(RPMBUILD)
  list(APPEND CPACK_GENERATOR RPM)
else()
  message(STATUS "No RPM packages: rpmbuild is missing (Debian package rpm)")
endif()
set(CPACK_COMPONENTS_ALL wzorinst debug)
foreach(tool IN ITEMS spb zorctl)
  if(TARGET ${tool})
    list(APPEND CPACK_COMPONENTS_ALL ${tool})
  endif()
endforeach()
set(CPACK_COMPONENTS_GROUPING IGNORE)
set(CPACK_PACKAGE_DIRECTORY ${CMAKE_BINARY_DIR}/packages)
set(CPACK_PROJECT_CONFIG_FILE ${CMAKE_CURRENT_SOURCE_DIR}/cpack_generator.cmake)
set(CPACK_PRE_BUILD_SCRIPTS ${CMAKE_CURRENT_SOURCE_DIR}/cpack_staged_files.cmake)
set(CPACK_RELEASE_TIME ${WZOR_RELEASE_TIME})
set(CPACK_DEBIAN_FILES ${CMAKE_CURRENT_SOURCE_DIR}/debian)

set(CPACK_PACKAGE_NAME wzorinst)
set(CPACK_PACKAGE_VENDOR "The maintainers of wzorinst")
set(CPACK_PACKAGE_CONTACT "The maintainers of wzorinst <wzorinst@localhost>")
set(WZORINST_SUMMARY "installer of the ZOR inventory-scanning toolkit")
set(SPB_SUMMARY "makes, checks and compares the packages that wzorinst installs")
set(ZORCTL_SUMMARY "status, verification, guarded runs and repair for ZOR installations")
set(DEBUG_SUMMARY "debug symbols of wzorinst")
foreach(component wzorinst spb zorctl debug)
  file(READ description-${component}.txt description)
  string(TOUPPER ${component} name)
  set(CPACK_DEBIAN_${name}_DESCRIPTION "${${name}_SUMMARY}\n${description}")
  set(CPACK_RPM_${name}_PACKAGE_SUMMARY "${${name}_SUMMARY}")
  set(CPACK_RPM_${name}_PACKAGE_DESCRIPTION "${description}")
endforeach()

# Archives: wzorinst-9.2.30-linux-i686.tar.gz, and so on.
set(CPACK_ARCHIVE_COMPONENT_INSTALL ON)
set(suffix ${PROJECT_VERSION}-linux-${CMAKE_SYSTEM_PROCESSOR})
set(CPACK_PACKAGE_FILE_NAME wzorinst-${suffix}) # the archives' top directory
set(CPACK_ARCHIVE_WZORINST_FILE_NAME wzorinst-${suffix})
set(CPACK_ARCHIVE_SPB_FILE_NAME wzorinst-spb-${suffix})
set(CPACK_ARCHIVE_ZORCTL_FILE_NAME wzorinst-zorctl-${suffix})
set(CPACK_ARCHIVE_DEBUG_FILE_NAME wzorinst-debug-${suffix})

# Debian packages: wzorinst_9.2.30-1_i386.deb, and so on. The oldest C library is in the list
# that scripts/check_binary compares the binary with. Programs of either architecture serve products of the
# other one, hence "foreign"; CPack has no variable for that before 3.31, so it is the second line of
# another field.
file(STRINGS needs-${CMAKE_SYSTEM_PROCESSOR}.txt c_library REGEX "^libc\\.so\\.6: ")
string(REPLACE "libc.so.6: GLIBC_" "" c_library ${c_library})
set(debian_name_of_i686 i386)
set(debian_name_of_x86_64 amd64)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_COMPRESSION_TYPE xz)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_DEBIAN_PACKAGE_ARCHITECTURE ${debian_name_of_${CMAKE_SYSTEM_PROCESSOR}})
set(CPACK_DEBIAN_PACKAGE_RELEASE 1)
set(CPACK_DEBIAN_WZORINST_PACKAGE_NAME wzorinst)
set(CPACK_DEBIAN_WZORINST_PACKAGE_SECTION "admin\nMulti-Arch: foreign")
set(CPACK_DEBIAN_WZORINST_PACKAGE_DEPENDS "libc6 (>= ${c_library})")
set(CPACK_DEBIAN_WZORINST_PACKAGE_SUGGESTS "wzorinst-spb, wzorinst-zorctl")
set(CPACK_DEBIAN_SPB_PACKAGE_NAME wzorinst-spb)
set(CPACK_DEBIAN_SPB_PACKAGE_SECTION "devel\nMulti-Arch: foreign")
set(CPACK_DEBIAN_SPB_PACKAGE_DEPENDS "libc6 (>= ${c_library})")
set(CPACK_DEBIAN_SPB_PACKAGE_SUGGESTS "debhelper, openssh-client")
# zorctl shares the installer's library and starts both programs: all are of one version.
set(CPACK_DEBIAN_ZORCTL_PACKAGE_NAME wzorinst-zorctl)
set(CPACK_DEBIAN_ZORCTL_PACKAGE_SECTION "admin\nMulti-Arch: foreign")
set(CPACK_DEBIAN_ZORCTL_PACKAGE_DEPENDS
    "libc6 (>= ${c_library}), wzorinst (= ${PROJECT_VERSION}-1), wzorinst-spb (= ${PROJECT_VERSION}-1)"
)
set(CPACK_DEBIAN_ZORCTL_PACKAGE_SUGGESTS openssh-client)
set(CPACK_DEBIAN_DEBUG_PACKAGE_NAME wzorinst-dbgsym)
set(CPACK_DEBIAN_DEBUG_PACKAGE_SECTION "debug\nMulti-Arch: same")
set(CPACK_DEBIAN_DEBUG_PACKAGE_DEPENDS "wzorinst (= ${PROJECT_VERSION}-1)")

# RPM packages: wzorinst-9.2.30-1.i686.rpm, and so on. The needs of programs are found by rpm.
set(CPACK_RPM_COMPONENT_INSTALL ON)
set(CPACK_RPM_MAIN_COMPONENT wzorinst)
set(CPACK_RPM_FILE_NAME RPM-DEFAULT)
set(CPACK_RPM_COMPRESSION_TYPE xz)
set(CPACK_RPM_PACKAGE_ARCHITECTURE ${CMAKE_SYSTEM_PROCESSOR})
set(CPACK_RPM_PACKAGE_RELEASE 1)
set(CPACK_RPM_PACKAGE_LICENSE unknown) # none has been chosen; the format demands a word
set(CPACK_RPM_PACKAGE_RELOCATABLE OFF)
set(CPACK_RPM_WZORINST_PACKAGE_GROUP System/Management)
set(CPACK_RPM_SPB_PACKAGE_NAME wzorinst-spb)
set(CPACK_RPM_SPB_PACKAGE_GROUP Development/Tools)
set(CPACK_RPM_ZORCTL_PACKAGE_NAME wzorinst-zorctl)
set(CPACK_RPM_ZORCTL_PACKAGE_GROUP System/Management)
set(CPACK_RPM_ZORCTL_PACKAGE_REQUIRES
    "wzorinst = ${PROJECT_VERSION}-1, wzorinst-spb = ${PROJECT_VERSION}-1")
set(CPACK_RPM_DEBUG_PACKAGE_NAME wzorinst-debuginfo)
set(CPACK_RPM_DEBUG_PACKAGE_GROUP Development/Debug)
set(CPACK_RPM_DEBUG_PACKAGE_REQUIRES "wzorinst = ${PROJECT_VERSION}-1")
# Directories that belong to the system's own packages; and rpm neither changes files nor adds any.
# The Perl files serve machines with debhelper alone, so they require nothing.
set(CPACK_RPM_EXCLUDE_FROM_AUTO_FILELIST_ADDITION
    /usr/share/bash-completion
    /usr/share/bash-completion/completions
    /usr/lib/rpm
    /usr/lib/rpm/macros.d
    /usr/share/debhelper
    /usr/share/debhelper/autoscripts
    /usr/share/man
    /usr/share/man/man1
    /usr/share/man/man8
    /usr/share/perl5
    /usr/share/perl5/Debian
    /usr/share/perl5/Debian/Debhelper
    /usr/share/perl5/Debian/Debhelper/Sequence
    /usr/lib/debug
    /usr/lib/debug/usr
    /usr/lib/debug/usr/bin)
set(CPACK_RPM_SPEC_MORE_DEFINE
    "%define __os_install_post %{nil}
%define _build_id_links none
%define _buildhost localhost
%define __requires_exclude ^perl|^/usr/bin/perl
%define __provides_exclude ^perl
%define use_source_date_epoch_as_buildtime 1
%define clamp_mtime_to_source_date_epoch 1")

include(CPack)
