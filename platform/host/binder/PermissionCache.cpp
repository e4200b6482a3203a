// PermissionCache without a permission controller: the answers come from the
// host binder's control API (HostBinder.h). What libbinder decides itself,
// root and the process's own calls being granted, is kept.
#include <binder/IPCThreadState.h>
#include <binder/PermissionCache.h>
#include <unistd.h>
#include <utils/String8.h>

#include <map>
#include <mutex>
#include <utility>

#include "HostBinder.h"

namespace android {

bool PermissionCache::checkCallingPermission(const String16& permission) {
    return checkCallingPermission(permission, nullptr, nullptr);
}

bool PermissionCache::checkCallingPermission(const String16& permission, int32_t* outPid,
                                             int32_t* outUid) {
    const IPCThreadState* ipc = IPCThreadState::self();
    const pid_t pid = ipc->getCallingPid();
    const uid_t uid = ipc->getCallingUid();
    if (outPid != nullptr) *outPid = pid;
    if (outUid != nullptr) *outUid = static_cast<int32_t>(uid);
    return checkPermission(permission, pid, uid);
}

bool PermissionCache::checkPermission(const String16& permission, pid_t pid, uid_t uid) {
    if (uid == 0 || pid == getpid()) return true;
    return hostbinder::permissionGranted(String8(permission).string(), uid);
}

}  // namespace android

namespace hostbinder {

namespace {

std::mutex gLock;
std::map<std::pair<std::string, uid_t>, bool>& answers() {
    static auto* table = new std::map<std::pair<std::string, uid_t>, bool>();
    return *table;
}

}  // namespace

void setPermission(const std::string& permission, uid_t uid, bool granted) {
    std::lock_guard<std::mutex> lock(gLock);
    answers()[{permission, uid}] = granted;
}

void clearPermissions() {
    std::lock_guard<std::mutex> lock(gLock);
    answers().clear();
}

bool permissionGranted(const std::string& permission, uid_t uid) {
    std::lock_guard<std::mutex> lock(gLock);
    const auto it = answers().find({permission, uid});
    return it != answers().end() && it->second;
}

}  // namespace hostbinder
