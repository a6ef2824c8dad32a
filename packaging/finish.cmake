# SPDX-License-Identifier: Apache-2.0
# CPack runs this over the files of both packages before they are packed: what Debian wants
# otherwise than a plain install.
foreach(pair tools:kestmodem-tools service:kestmodem)
    string(REPLACE ":" ";" pair ${pair})
    list(GET pair 0 component)
    list(GET pair 1 package)
    set(share ${CPACK_TEMPORARY_DIRECTORY}/${component}/usr/share)
    string(TIMESTAMP date "%a, %d %b %Y %H:%M:%S +0000" UTC)  # of SOURCE_DATE_EPOCH, if set
    file(WRITE ${share}/doc/${package}/changelog "kestmodem (${CPACK_PACKAGE_VERSION}) unstable; \
urgency=medium\n\n  * Built from the sources; CHANGELOG.md there has the changes.\n\n \
-- ${CPACK_PACKAGE_CONTACT}  ${date}\n")
    file(GLOB_RECURSE texts ${share}/man/*.[1-8] ${share}/doc/${package}/changelog)
    foreach(text IN LISTS texts)
        file(CHMOD ${text} PERMISSIONS OWNER_READ OWNER_WRITE GROUP_READ WORLD_READ)
        execute_process(COMMAND gzip -9nf ${text} COMMAND_ERROR_IS_FATAL ANY)
    endforeach()
    # The documents of the reader, which a plain install puts beside those of the service.
    if(component STREQUAL tools)
        file(COPY ${share}/doc/kestmodem/ DESTINATION ${share}/doc/${package})
        file(REMOVE_RECURSE ${share}/doc/kestmodem)
    endif()
endforeach()
