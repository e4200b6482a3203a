/*
 * Where the modem pipe lives. On the device this is the path the system
 * names; the host build lets a test or the simulator put a pseudo-terminal
 * in its place (see docs/host-platform.md).
 */
#ifndef QUELLBORN_PLATFORM_MODEMPIPE_H
#define QUELLBORN_PLATFORM_MODEMPIPE_H

#ifdef __cplusplus
extern "C" {
#endif

const char* platformModemPipePath(const char* devicePath);

#ifdef __cplusplus
}
#endif

#endif /* QUELLBORN_PLATFORM_MODEMPIPE_H */
