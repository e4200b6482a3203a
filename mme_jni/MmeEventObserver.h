// Receiver of the media engine's stream events (RTP first packet, break,
// received), registered by the engine at start-up.
#ifndef QUELLBORN_MME_JNI_MMEEVENTOBSERVER_H
#define QUELLBORN_MME_JNI_MMEEVENTOBSERVER_H

#include <atomic>

namespace android {

class MmeEventObserver {
public:
    virtual ~MmeEventObserver() = default;
    virtual void mmeEvtUpdate(int event) = 0;
};

// Stores the observer (null unregisters); returns 0.
int registerMmeEventObserver(MmeEventObserver* observer);
// Takes `observer` away if it is the one registered and waits for the event
// calls that reached it already: it may be deleted once this returns.
void unregisterMmeEventObserver(MmeEventObserver* observer);
// Calls `observer->mmeEvtUpdate(event)` on the registered observer; false if there is none.
bool forwardMmeEvent(int event);

// Read by the media engine's event thread while binder threads may register:
// an atomic keeps the hand-over clean.
extern std::atomic<MmeEventObserver*> m_pMmeEventObserver;

}  // namespace android

#endif  // QUELLBORN_MME_JNI_MMEEVENTOBSERVER_H
