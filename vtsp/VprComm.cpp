#include "VprComm.h"

#include <cstring>

namespace android {

void copyExtmapUri(const VtspStmVideoView& view, char (&out)[kExtmapUriSize + 1]) {
    const size_t n = strnlen(view.extmapUri, kExtmapUriSize);
    memcpy(out, view.extmapUri, n);
    out[n] = '\0';
}

void swapAddress(OSAL_NetAddress& addr) {
    swap16(addr.port);
    for (uint16_t& group : addr.ipv6) swap16(group);
}

}  // namespace android
