# What `cmake --install` puts where, in three components: the plug-in, what a host of it is built with, the program.
# Everything finds everything else by its own place, so that the tree can be moved.
set(plugin_folder ${CMAKE_INSTALL_LIBDIR}/applicationsync)
set(header_folder ${CMAKE_INSTALL_INCLUDEDIR}/applicationsync)
set(config_folder ${CMAKE_INSTALL_LIBDIR}/cmake/ApplicationSync)
set(pkgconfig_folder ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
set(share_folder ${CMAKE_INSTALL_DATADIR}/applicationsync)

install(TARGETS ApplicationSync LIBRARY DESTINATION ${plugin_folder} COMPONENT library)

# The interfaces and the value types. What only the plug-in and the codec are written with stays behind.
set(private_headers Arena Message SerialQueue ThreadSafety ValueBuilder WaitGroup DateText)
list(TRANSFORM private_headers APPEND "\\.h$")
list(JOIN private_headers "|" private_headers)
install(DIRECTORY ${CMAKE_SOURCE_DIR}/platform DESTINATION ${header_folder} COMPONENT development
        FILES_MATCHING PATTERN *.h REGEX "/(${private_headers})" EXCLUDE)
set(record_headers RecordingPlatform.h RecordedCalls.h Redact.h Replay.h Operation.h Show.h Sink.h)
install(FILES ${CMAKE_SOURCE_DIR}/plist/PropertyList.h DESTINATION ${header_folder}/plist COMPONENT development)
list(TRANSFORM record_headers PREPEND ${CMAKE_SOURCE_DIR}/record/)
install(FILES ${record_headers} DESTINATION ${header_folder}/record COMPONENT development)
install(TARGETS platform plist record EXPORT ApplicationSync ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT development)
install(EXPORT ApplicationSync NAMESPACE ApplicationSync:: FILE ApplicationSyncTargets.cmake
        DESTINATION ${config_folder} COMPONENT development)

include(CMakePackageConfigHelpers)
configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/ApplicationSyncConfig.cmake.in
                              ${CMAKE_BINARY_DIR}/packaging/ApplicationSyncConfig.cmake
                              INSTALL_DESTINATION ${config_folder} PATH_VARS plugin_folder share_folder)
write_basic_package_version_file(${CMAKE_BINARY_DIR}/packaging/ApplicationSyncConfigVersion.cmake
                                 COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_BINARY_DIR}/packaging/ApplicationSyncConfig.cmake
              ${CMAKE_BINARY_DIR}/packaging/ApplicationSyncConfigVersion.cmake
        DESTINATION ${config_folder} COMPONENT development)

file(RELATIVE_PATH prefix_from_pkgconfig /${pkgconfig_folder} /)
foreach(name applicationsync applicationsync-plist applicationsync-record)
  configure_file(${CMAKE_CURRENT_LIST_DIR}/${name}.pc.in ${CMAKE_BINARY_DIR}/packaging/${name}.pc @ONLY)
  install(FILES ${CMAKE_BINARY_DIR}/packaging/${name}.pc DESTINATION ${pkgconfig_folder} COMPONENT development)
endforeach()

install(DIRECTORY ${CMAKE_SOURCE_DIR}/contract DESTINATION ${share_folder} COMPONENT development
        FILES_MATCHING PATTERN *.h PATTERN *.cpp)
install(DIRECTORY ${CMAKE_SOURCE_DIR}/examples/minimal-daemon DESTINATION ${share_folder}/examples
        COMPONENT development)

# The documents, for those who build a host and for those who run the program.
foreach(place development/libapplicationsync-dev program/tsd)
  string(REPLACE "/" ";" place ${place})
  list(GET place 0 component)
  list(GET place 1 name)
  install(DIRECTORY ${CMAKE_SOURCE_DIR}/docs/ DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/${name} COMPONENT ${component}
          FILES_MATCHING PATTERN *.md PATTERN *.png PATTERN *.svg PATTERN README.md EXCLUDE)
endforeach()

# The program, with its manual pages and completions, which it writes itself.
set(pages ${CMAKE_BINARY_DIR}/packaging/man)
set(completions ${CMAKE_BINARY_DIR}/packaging/completions)
set(written_by_program ${pages}/tsd.1)
add_custom_command(OUTPUT ${pages}/tsd.1 COMMAND ${CMAKE_COMMAND} -E rm -rf ${pages} COMMAND tsd manual ${pages}
                   DEPENDS tsd VERBATIM)
foreach(shell bash zsh fish)
  add_custom_command(OUTPUT ${completions}/${shell} COMMAND ${CMAKE_COMMAND} -E make_directory ${completions}
                     COMMAND tsd completion ${shell} > ${completions}/${shell} DEPENDS tsd VERBATIM)
  list(APPEND written_by_program ${completions}/${shell})
endforeach()
# Nothing is installed from a build with a sanitizer, which may not even run where it is built.
if(NOT INSTRUMENTED)
  set(always ALL)
endif()
add_custom_target(written_by_program ${always} DEPENDS ${written_by_program})

install(TARGETS tsd RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT program)
install(DIRECTORY ${pages}/ DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT program)
install(FILES ${completions}/bash DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions RENAME tsd
        COMPONENT program)
install(FILES ${completions}/zsh DESTINATION ${CMAKE_INSTALL_DATADIR}/zsh/vendor-completions RENAME _tsd
        COMPONENT program)
install(FILES ${completions}/fish DESTINATION ${CMAKE_INSTALL_DATADIR}/fish/vendor_completions.d RENAME tsd.fish
        COMPONENT program)
set_property(SOURCE ${CMAKE_SOURCE_DIR}/tsd/command/main.cpp TARGET_DIRECTORY tsd
             APPEND PROPERTY COMPILE_DEFINITIONS TSD_VERSION="${PROJECT_VERSION}")
# Where the program looks for the plug-in when it does not lie beside it.
file(RELATIVE_PATH plugin_from_program /${CMAKE_INSTALL_BINDIR} /${plugin_folder})
set_property(SOURCE ${CMAKE_SOURCE_DIR}/tsd/daemon/PluginLoader.cpp TARGET_DIRECTORY tsd
             APPEND PROPERTY COMPILE_DEFINITIONS PLUGIN_FOLDER="${plugin_from_program}")
