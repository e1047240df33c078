// Interfaces found by identifier: those an object offers and the host's process-wide core
// interfaces.
#pragma once

#include <trelm/core/class_id.h>

namespace TrelmSDK {

// Base of every interface an object or the host hands out by Interface_ID.
class BaseInterface {
public:
    virtual ~BaseInterface() = default;
    virtual Interface_ID GetID() const = 0;
};

// A function-published interface: the kind the host exposes to plug-ins and scripts.
class FPInterface : public BaseInterface {};

// Registers a process-wide core interface under its GetID(); a later registration with the same
// identifier replaces the earlier one. The interface is not owned and must outlive its
// registration. Main thread at start-up; lookups may then come from any thread.
void RegisterCOREInterface(FPInterface* fpi);
// Removes the registration of exactly this interface (another one under its ID is left alone).
void UnregisterCOREInterface(FPInterface* fpi);
// The core interface registered under id, or none.
FPInterface* GetCOREInterface(Interface_ID id);

} // namespace TrelmSDK

using TrelmSDK::BaseInterface;
using TrelmSDK::FPInterface;
using TrelmSDK::GetCOREInterface;
