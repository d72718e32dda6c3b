# Run by CPack between the installation into its own directory and the packaging of that.

# Only Debian packages hold a changelog in Debian's format, and reasons for what lintian reports.
if(CPACK_GENERATOR STREQUAL "DEB")
  foreach(component IN LISTS CPACK_COMPONENTS_ALL)
    string(TOUPPER ${component} name)
    set(package ${CPACK_DEBIAN_${name}_PACKAGE_NAME})
    set(share ${CPACK_TEMPORARY_INSTALL_DIRECTORY}/${component}/usr/share)
    file(COPY ${CPACK_DEBIAN_FILES}/changelog DESTINATION ${share}/doc/${package})
    file(RENAME ${share}/doc/${package}/changelog ${share}/doc/${package}/changelog.Debian)
    execute_process(COMMAND gzip --force --no-name --best ${share}/doc/${package}/changelog.Debian
                            COMMAND_ERROR_IS_FATAL ANY)
    file(READ ${CPACK_DEBIAN_FILES}/lintian-overrides overrides)
    if(component STREQUAL "debug")
      file(READ ${CPACK_DEBIAN_FILES}/lintian-overrides-debug more)
    else()
      file(READ ${CPACK_DEBIAN_FILES}/lintian-overrides-program more)
    endif()
    file(WRITE ${share}/lintian/overrides/${package} "${overrides}${more}")
  endforeach()
  file(GLOB_RECURSE texts ${CPACK_TEMPORARY_INSTALL_DIRECTORY}/*/usr/share/lintian/*
       ${CPACK_TEMPORARY_INSTALL_DIRECTORY}/*/usr/share/doc/*)
  file(
    CHMOD
    ${texts}
    PERMISSIONS
    OWNER_READ
    OWNER_WRITE
    GROUP_READ
    WORLD_READ)
endif()

# What is packaged has the time of the release, and directories have their mode whatever the umask
# was.
execute_process(COMMAND find ${CPACK_TEMPORARY_INSTALL_DIRECTORY} -type d -exec chmod 0755 {} +
                        COMMAND_ERROR_IS_FATAL ANY)
execute_process(COMMAND find ${CPACK_TEMPORARY_INSTALL_DIRECTORY} -exec touch --no-dereference
                        --date=@$ENV{SOURCE_DATE_EPOCH} {} + COMMAND_ERROR_IS_FATAL ANY)
