# Writes one data file as a byte array (with a final NUL) into a C++ source file.
#   cmake -DINPUT=... -DOUTPUT=... -DSYMBOL=... -P embed_file.cmake
# The array is TknCtl::Linux::SYMBOL (const char[]).
file(READ "${INPUT}" hex HEX)
string(REGEX REPLACE "([0-9a-f][0-9a-f])" "0x\\1," bytes "${hex}")
string(REGEX REPLACE "(0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,)" "\\1\n"
       bytes "${bytes}")
get_filename_component(name "${INPUT}" NAME)
file(WRITE "${OUTPUT}.new"
     "// Generated from platform/hostctl/linux/data/${name}; do not edit.\n"
     "namespace TknCtl::Linux {\n\n"
     "extern const char ${SYMBOL}[];\n"
     "const char ${SYMBOL}[] = {\n${bytes}0x00};\n\n"
     "}  // namespace TknCtl::Linux\n")
file(RENAME "${OUTPUT}.new" "${OUTPUT}")
