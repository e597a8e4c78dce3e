# Run by CPack between staging and packing: each package gets its copyright and
# changelog, pages are compressed, programs and static libraries lose what only
# debuggers and compilers use.

if(NOT CPACK_GENERATOR STREQUAL DEB)
  return()
endif()

find_program(gzip gzip REQUIRED)
find_program(strip strip REQUIRED)
string(TIMESTAMP date "%a, %d %b %Y %H:%M:%S +0000" UTC)

foreach(component ${CPACK_COMPONENTS_ALL})
  string(TOUPPER ${component} upper)
  set(prefix ${CPACK_TEMPORARY_DIRECTORY}/${component}${CPACK_PACKAGING_INSTALL_PREFIX})
  set(share ${prefix}/share)
  set(doc ${share}/doc/${CPACK_DEBIAN_${upper}_PACKAGE_NAME})

  # Not by file(INSTALL), which would prepend DESTDIR.
  file(MAKE_DIRECTORY ${doc})
  file(COPY_FILE ${CPACK_KELVO_LICENSE} ${doc}/copyright)
  file(WRITE ${doc}/changelog
       "kelvo (${CPACK_PACKAGE_VERSION}) unstable; urgency=medium\n\n"
       "  * Packaged from the source tree, whose CHANGELOG.md says what changed.\n\n"
       " -- ${CPACK_PACKAGE_CONTACT}  ${date}\n")

  file(CHMOD ${doc}/copyright ${doc}/changelog
       PERMISSIONS OWNER_READ OWNER_WRITE GROUP_READ WORLD_READ)

  file(GLOB_RECURSE pages ${share}/man/*.[1-9])
  foreach(file ${pages} ${doc}/changelog)
    execute_process(COMMAND ${gzip} -9nf ${file} COMMAND_ERROR_IS_FATAL ANY)
  endforeach()
  file(GLOB programs ${prefix}/bin/*)
  foreach(file ${programs})
    execute_process(COMMAND ${strip} --strip-unneeded --remove-section=.comment
                            --remove-section=.note ${file}
                    COMMAND_ERROR_IS_FATAL ANY)
  endforeach()
  file(GLOB_RECURSE libraries ${prefix}/lib/*.a)
  foreach(file ${libraries})
    execute_process(COMMAND ${strip} --strip-debug --remove-section=.comment
                            --enable-deterministic-archives ${file}
                    COMMAND_ERROR_IS_FATAL ANY)
  endforeach()
endforeach()
