# As Debian has it: manual pages and changelogs are compressed, without a time in them.
file(GLOB_RECURSE texts ${CPACK_TEMPORARY_DIRECTORY}/*/man1/*.1 ${CPACK_TEMPORARY_DIRECTORY}/*/doc/*/changelog)
execute_process(COMMAND gzip -9nf ${texts} COMMAND_ERROR_IS_FATAL ANY)
