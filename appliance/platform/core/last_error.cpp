// The last error of the calling thread.

#include "appliance/platform/contract.h"

namespace {

thread_local int lastCode = 0;
thread_local const char* lastFile = "";
thread_local int lastLine = 0;

}  // namespace

extern "C" {

int VLIBCErrGet(void) {
    return lastCode;
}

const char* VLIBCErrorGetFile(void) {
    return lastFile;
}

int VLIBCErrorGetLine(void) {
    return lastLine;
}

void VLIBCErrSetEx(int code, const char* file, int line) {
    lastCode = code;
    lastFile = file == nullptr ? "" : file;
    lastLine = line;
}

}  // extern "C"
