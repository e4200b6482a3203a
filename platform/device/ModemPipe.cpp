// Device side of the modem pipe seam: the system's own path, unchanged.
#include "ModemPipe.h"

extern "C" const char* platformModemPipePath(const char* devicePath) {
    return devicePath;
}
