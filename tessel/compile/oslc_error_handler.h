// OSLC_ErrorHandler: the one OpenImageIO error handler of the process, routing compiler,
// shading-system and module messages to the host's render message window and system log.
#pragma once

#include <OSL/oslconfig.h>

#include <cstdint>
#include <mutex>
#include <string>

// How one severity reaches the host (see OSLC_ErrorHandler::RouteFor).
struct OSLMessageRoute {
    std::uint32_t renderMessageType; // IRenderMessageManager message type
    std::uint32_t systemLogType;     // system-log type given to the render message window
    std::uint32_t logEntryType;      // system log entry type, 0 when no entry is written
};

class OSLC_ErrorHandler : public OIIO::ErrorHandler {
public:
    // Called from any thread (render threads through the shading system); serialised by mutex_.
    void operator()(int errcode, const std::string& msg) override;

    // The routing of a severity (errcode & 0xFFFF0000).
    static OSLMessageRoute RouteFor(int errcode);

private:
    std::mutex mutex_; // serialises the routing of concurrent messages
};

// The shared instance, constructed at module load and alive until the process ends.
OSLC_ErrorHandler& SharedOSLCErrorHandler();

// Render message source of the module's messages.
inline constexpr int kOSLMessageSource = 1;
// Title of the module's system log entries.
inline constexpr const char* kOSLLogTitle = "OSLTex";
