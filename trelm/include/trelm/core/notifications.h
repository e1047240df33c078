// Host notifications: callbacks registered for numeric codes and called when a code is broadcast.
#pragma once

namespace TrelmSDK {

// What a callback receives: the code broadcast and the broadcaster's information record (none
// when the code carries none).
struct NotifyInfo {
    int intcode;
    void* callParam;
};

using NOTIFYPROC = void (*)(void* param, NotifyInfo* info);

// Registers proc with its user data for code. A (proc, param, code) triple is registered once:
// a second registration is refused (false). Callbacks are called in registration order.
//
// Threads: registration, unregistration and broadcast may come from any thread; callbacks run on
// the broadcasting thread (the host broadcasts its codes on the main thread). A callback
// unregistered during a broadcast is not called later in that broadcast, and a callback may
// (un)register others; a call already running on another thread is not waited for.
bool RegisterNotification(NOTIFYPROC proc, void* param, int code);
// Removes one registration; false when it was not registered.
bool UnRegisterNotification(NOTIFYPROC proc, void* param, int code);
// Removes the registrations of (proc, param) for every code; returns how many were removed.
int UnRegisterNotification(NOTIFYPROC proc, void* param);
// Calls every callback registered for code with the information record callParam.
void BroadcastNotification(int code, void* callParam = nullptr);

} // namespace TrelmSDK

using TrelmSDK::BroadcastNotification;
using TrelmSDK::NotifyInfo;
using TrelmSDK::NOTIFYPROC;
using TrelmSDK::RegisterNotification;
using TrelmSDK::UnRegisterNotification;
