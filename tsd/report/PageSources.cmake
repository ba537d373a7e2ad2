# Makes OUTPUT, the source file that holds the page's files, which lie in FOLDER.
file(WRITE ${OUTPUT}.new "#include \"tsd/report/PageSources.h\"\n\nnamespace tsd {\n")
foreach(each reportMarkup=report.html reportStyle=report.css reportScript=report.js)
  string(REPLACE "=" ";" each ${each})
  list(GET each 0 name)
  list(GET each 1 file)
  file(READ ${FOLDER}/${file} text HEX)
  string(REGEX REPLACE "(..)" "\\\\x\\1" text "${text}")
  # A line for every so many bytes: compilers limit a line's length.
  string(REGEX REPLACE "(................................................................................................................................)"
                       "\\1\"\n\"" text "${text}")
  file(APPEND ${OUTPUT}.new "const std::string_view ${name} =\n\"${text}\";\n")
endforeach()
file(APPEND ${OUTPUT}.new "}  // namespace tsd\n")
file(RENAME ${OUTPUT}.new ${OUTPUT})
