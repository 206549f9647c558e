# CPack has a package with a library run ldconfig when it is installed and removed, by scripts, and
# can't be told otherwise. The trigger, which is there too, has it run once for all packages that
# are installed together; so the scripts are taken out again.
foreach(package IN LISTS CPACK_PACKAGE_FILES)
  set(contents ${CPACK_TEMPORARY_DIRECTORY}/contents)
  file(REMOVE_RECURSE ${contents})
  execute_process(COMMAND dpkg-deb --raw-extract ${package} ${contents} COMMAND_ERROR_IS_FATAL ANY)
  if(EXISTS ${contents}/DEBIAN/triggers)
    file(REMOVE ${contents}/DEBIAN/postinst ${contents}/DEBIAN/postrm)
    execute_process(COMMAND dpkg-deb --root-owner-group --build ${contents} ${package}
                    OUTPUT_QUIET COMMAND_ERROR_IS_FATAL ANY)
  endif()
endforeach()
