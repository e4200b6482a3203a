// Glue between the closed video library's event listener and the engine:
// the library is started once per process, `listen` scans each event's JSON
// with its template and forwards capture and render events to the one
// registered observer.
#ifndef QUELLBORN_VOLTE_ZMFEVENTOBSERVER_H
#define QUELLBORN_VOLTE_ZMFEVENTOBSERVER_H

#include <atomic>

namespace android {

class ZmfEventObserver {
public:
    virtual ~ZmfEventObserver() = default;
    virtual void zmfRenderEvtUpdate(int event, const char* renderId, int sourceType, int width,
                                    int height) = 0;
    virtual void zmfCaptureEvtUpdate(int event, const char* captureId, int width, int height,
                                     int frameRate) = 0;
};

// Starts the video library and registers `listen`, once per process.
void zmfInitialize();
// Removes the listener and stops the library if zmfInitialize started it.
int zmfTerminate();
// Stores the observer that forwarded events reach (null unregisters); returns 0.
int registerZmfEventObserver(ZmfEventObserver* observer);
// Takes `observer` away if it is the one registered and waits for the event
// calls that reached it already: it may be deleted once this returns.
void unregisterZmfEventObserver(ZmfEventObserver* observer);
// The listener registered with the video library.
void listen(int event, const char* json, int arg);

// Listener thread and binder threads both use these, hence atomics.
extern std::atomic<ZmfEventObserver*> m_pZmfEventObserver;

}  // namespace android

// 1 while the video library is initialised by this glue; exported so other
// components of the process can see it.
extern "C" unsigned char _zmf;

#endif  // QUELLBORN_VOLTE_ZMFEVENTOBSERVER_H
