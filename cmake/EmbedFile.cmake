# Writes a C++ source defining kest::detail::<NAME> (bytes of INPUT, zero-terminated) and
# <NAME>Size. Run at build time: cmake -DINPUT=... -DOUTPUT=... -DNAME=... -P EmbedFile.cmake
file(READ "${INPUT}" hex HEX)
string(LENGTH "${hex}" hexLength)
math(EXPR size "${hexLength} / 2")
string(REGEX REPLACE "([0-9a-f][0-9a-f])" "'\\\\x\\1'," bytes "${hex}")
string(REGEX REPLACE "(('[^']*',){16})" "\\1\n" bytes "${bytes}")
file(WRITE "${OUTPUT}.tmp"
  "// Generated from ${INPUT}; do not edit.\n"
  "#include <cstddef>\n"
  "namespace kest {\nnamespace detail {\n"
  "extern const char ${NAME}[];\nextern const std::size_t ${NAME}Size;\n"
  "const char ${NAME}[] = {\n${bytes}'\\0'};\n"
  "const std::size_t ${NAME}Size = ${size};\n"
  "}  // namespace detail\n}  // namespace kest\n")
file(COPY_FILE "${OUTPUT}.tmp" "${OUTPUT}" ONLY_IF_DIFFERENT)
file(REMOVE "${OUTPUT}.tmp")
