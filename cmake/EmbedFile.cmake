# A file's content as a C++ source:  cmake -DFROM=file -DTO=source.cpp -DHEADER=header.h -DFUNCTION=name -P EmbedFile.cmake
file(READ "${FROM}" _hex HEX)
string(REGEX REPLACE "([0-9a-f][0-9a-f])" "0x\\1," _bytes "${_hex}")
string(REGEX REPLACE "(................................................................................)" "\\1\n" _bytes "${_bytes}")
file(WRITE "${TO}" "#include \"${HEADER}\"\n\nnamespace qv {\n\nnamespace {\nconst unsigned char kContent[] = {\n${_bytes}};\n"
  "}\n\nstd::string ${FUNCTION}() { return {reinterpret_cast<const char*>(kContent), sizeof kContent}; }\n\n}  // namespace qv\n")
