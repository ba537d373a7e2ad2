# As Debian has it: manual pages and changelogs are compressed, without a time in them, and nothing keeps what only a
# debugger reads.
file(GLOB_RECURSE files ${CPACK_TEMPORARY_DIRECTORY}/*)
set(texts ${files})
list(FILTER texts INCLUDE REGEX "/man1/.*\\.1$|/doc/.*/changelog$")
execute_process(COMMAND gzip -9nf ${texts} COMMAND_ERROR_IS_FATAL ANY)
set(archives ${files})
list(FILTER archives INCLUDE REGEX "\\.a$")
execute_process(COMMAND strip --strip-debug --enable-deterministic-archives ${archives} COMMAND_ERROR_IS_FATAL ANY)
