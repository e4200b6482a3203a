// Host side of the modem pipe seam: QUELLBORN_MODEM_PIPE names the file
// (usually a pseudo-terminal) that stands in for the modem's device.
#include "ModemPipe.h"

#include <cstdlib>

extern "C" const char* platformModemPipePath(const char* devicePath) {
    const char* override = getenv("QUELLBORN_MODEM_PIPE");
    return override != nullptr && *override != '\0' ? override : devicePath;
}
