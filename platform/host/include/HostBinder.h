// Control API of the host binder stand-in: who is calling, and what the
// platform's permission check answers.
//
// On a device the driver tells a service the pid and uid of the process that
// sent each transaction (IPCThreadState::getCallingPid/getCallingUid), and
// PermissionCache asks the permission controller whether that uid holds a
// permission. In one host process a test thread plays the client process:
// it names the identity its transactions carry, and the test decides the
// controller's answers.
#ifndef QUELLBORN_HOST_HOSTBINDER_H
#define QUELLBORN_HOST_HOSTBINDER_H

#include <binder/IBinder.h>
#include <sys/types.h>
#include <utils/StrongPointer.h>

#include <string>
#include <vector>

namespace hostbinder {

// Transactions that the calling thread sends to local binders arrive as
// sent by process `pid` running as `uid`, until clearClientIdentity(). Without
// one they carry this process's own identity, as a call within a process does.
void setClientIdentity(pid_t pid, uid_t uid);
void clearClientIdentity();
// The identity set for the calling thread; false when none is set.
bool clientIdentity(pid_t* pid, uid_t* uid);

// The permission controller's answer for `permission` held by `uid`; a uid
// it was not told about is refused. As libbinder does, PermissionCache grants
// root (uid 0) and the process itself without asking.
void setPermission(const std::string& permission, uid_t uid, bool granted);
void clearPermissions();
bool permissionGranted(const std::string& permission, uid_t uid);

// What `adb shell dumpsys <service> args...` does: sends the dump
// transaction as a client's libbinder sends it (a file descriptor, the
// argument count, each argument as a String16) and answers what the service
// wrote to the descriptor. `status` receives the transaction's status.
std::string dumpsys(const android::sp<android::IBinder>& service, const std::vector<std::string>& args,
                    android::status_t* status = nullptr);

}  // namespace hostbinder

#endif  // QUELLBORN_HOST_HOSTBINDER_H
