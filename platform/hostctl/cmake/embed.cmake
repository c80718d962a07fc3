# Assembles the default host document from one JSON file per section and writes it as a
# byte array into a C++ source file.
#   cmake -DDATA_DIR=... -DOUTPUT=... -P embed.cmake
# Each file is named NN-<section>.json and holds that section's value; the document lists
# the sections in file-name order after "version".
file(GLOB parts "${DATA_DIR}/*.json")
list(SORT parts)
set(document "{\"version\":1")
foreach(part IN LISTS parts)
    get_filename_component(name "${part}" NAME_WE)
    string(REGEX REPLACE "^[0-9]+-" "" section "${name}")
    file(READ "${part}" content)
    string(STRIP "${content}" content)
    string(APPEND document ",\n\"${section}\":${content}")
endforeach()
string(APPEND document "\n}\n")

string(LENGTH "${document}" size)
file(WRITE "${OUTPUT}.txt" "${document}")
file(READ "${OUTPUT}.txt" hex HEX)
string(REGEX REPLACE "([0-9a-f][0-9a-f])" "0x\\1," bytes "${hex}")
string(REGEX REPLACE "(0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,0x..,)" "\\1\n"
       bytes "${bytes}")
file(WRITE "${OUTPUT}.new"
     "// Generated from platform/hostctl/data/default-host; do not edit.\n"
     "#include \"core/embedded.h\"\n\n"
     "namespace TknCtl::Lib {\n\n"
     "const unsigned char kDefaultHost[] = {\n${bytes}0x00};\n"
     "const std::size_t kDefaultHostSize = sizeof(kDefaultHost) - 1;\n\n"
     "}  // namespace TknCtl::Lib\n")
file(REMOVE "${OUTPUT}.txt")
file(RENAME "${OUTPUT}.new" "${OUTPUT}")
