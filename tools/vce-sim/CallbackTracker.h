// Which of the client's callbacks the engine may still notify. With several
// client threads, and handlers that call the service from inside a
// notification, the engine may take callback changes in another order than
// the client issued them: a registration sent while a notification is in
// progress waits for it, and the handler's own change inside that
// notification goes first. So a callback counts as retired only through a
// change issued after its own registration had returned, and only once that
// change has returned too: from then on an event reaching it is the engine's
// fault, whatever else is in flight.
#ifndef QUELLBORN_TOOLS_VCESIM_CALLBACKTRACKER_H
#define QUELLBORN_TOOLS_VCESIM_CALLBACKTRACKER_H

#include <mutex>
#include <set>
#include <vector>

class CallbackTracker {
public:
    // The callbacks a change may take away: those registered when it was issued.
    using Change = std::vector<int>;

    // A new callback's registration is about to be sent: the number that names it.
    int registering();
    // Its registration has returned.
    void registered(int callback);
    // A change of the callback (a registration, a clean, a release) is about to be sent.
    Change changeIssued() const;
    // It has returned: the engine no longer holds what was registered before it.
    void changeReturned(const Change& change);
    // The callback's binder is dead: nothing can reach it any more.
    void died(int callback);
    bool retired(int callback) const;
    // A registration has returned and nothing has taken it away since.
    bool anyRegistered() const;

private:
    mutable std::mutex mLock;
    int mLast = 0;
    std::set<int> mRegistered;  // returned and not retired
    std::set<int> mRetired;
};

#endif  // QUELLBORN_TOOLS_VCESIM_CALLBACKTRACKER_H
