// Routing of OSL and module messages to the host's message window and system log.
#include "compile/oslc_error_handler.h"

#include <trelm/core/core_interface.h>
#include <trelm/core/mstr.h>
#include <trelm/log/render_message_manager.h>
#include <trelm/log/system_log.h>

OSLMessageRoute OSLC_ErrorHandler::RouteFor(int errcode) {
    switch (static_cast<std::uint32_t>(errcode) & 0xFFFF0000u) {
    case 0x10000:
        return {TrelmSDK::kType_Info, TrelmSDK::SYSLOG_INFO, 0};
    case 0x20000:
        return {TrelmSDK::kType_Warning, TrelmSDK::SYSLOG_WARN, TrelmSDK::SYSLOG_WARN};
    case 0x30000:
        return {TrelmSDK::kType_Error, TrelmSDK::SYSLOG_ERROR, TrelmSDK::SYSLOG_ERROR};
    case 0x40000:
        return {TrelmSDK::kType_Fatal, TrelmSDK::SYSLOG_ERROR, TrelmSDK::SYSLOG_ERROR};
    default:
        return {TrelmSDK::kType_Debug, TrelmSDK::SYSLOG_DEBUG, 0};
    }
}

void OSLC_ErrorHandler::operator()(int errcode, const std::string& msg) {
    const MSTR text = TrelmSDK::FromUTF8(msg);
    const OSLMessageRoute route = RouteFor(errcode);
    std::lock_guard<std::mutex> lock(mutex_);
    auto* manager = static_cast<IRenderMessageManager*>(
        GetCOREInterface(TrelmSDK::IRENDERMESSAGEMANAGER_INTERFACE_ID));
    if (!manager) manager = &TrelmSDK::GetRenderMessageManager();
    manager->LogMessage(kOSLMessageSource, route.renderMessageType, route.systemLogType,
                        std::wstring_view(text));
    if (route.logEntryType != 0)
        TrelmSDK::GetSystemLog().LogEntry(route.logEntryType, TrelmSDK::NO_DIALOG,
                                          std::wstring_view(L"OSLTex"), std::wstring_view(text));
}

OSLC_ErrorHandler& SharedOSLCErrorHandler() {
    // Never destroyed: render threads and static destructors may still report at exit.
    static OSLC_ErrorHandler* handler = new OSLC_ErrorHandler;
    return *handler;
}

namespace {
// Constructed at module load, as the host expects of the shared handler.
[[maybe_unused]] const OSLC_ErrorHandler& gLoadTimeHandler = SharedOSLCErrorHandler();
} // namespace
