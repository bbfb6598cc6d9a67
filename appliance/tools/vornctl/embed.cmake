# Makes OUTPUT, the source that holds the catalogues CODES and METHODS:
# cmake -D OUTPUT=... -D CODES=... -D METHODS=... -P embed.cmake
file(READ ${CODES} codes)
file(READ ${METHODS} methods)
file(WRITE ${OUTPUT} "#include \"appliance/tools/vornctl/embedded.h\"

namespace appliance::ctl {

const char kEmbeddedErrorCodes[] = R\"catalogue(${codes})catalogue\";

const char kEmbeddedMethods[] = R\"catalogue(${methods})catalogue\";

}  // namespace appliance::ctl
")
