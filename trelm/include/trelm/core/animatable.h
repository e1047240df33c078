// The root of every host object: class identity, sub-animatables, parameter blocks and interfaces.
#pragma once

#include <trelm/core/class_id.h>
#include <trelm/core/core_interface.h>
#include <trelm/core/mstr.h>

namespace TrelmSDK {

class IParamBlock2;

// Objects are created on the heap and deleted through DeleteThis(), never copied.
class Animatable {
public:
    Animatable() = default;
    Animatable(const Animatable&) = delete;
    Animatable& operator=(const Animatable&) = delete;
    virtual ~Animatable() = default;

    virtual Class_ID ClassID() const { return Class_ID(0, 0); }
    virtual SClass_ID SuperClassID() const = 0;
    // The per-object class name; the localised variant when localized is true.
    virtual void GetClassName(MSTR& s, bool localized = true) const {
        (void)localized;
        s.clear();
    }

    // Sub-animatables: the animatable children shown in the host's track view.
    virtual int NumSubs() { return 0; }
    virtual Animatable* SubAnim(int i) {
        (void)i;
        return nullptr;
    }
    virtual MSTR SubAnimName(int i, bool localized = true) {
        (void)i, (void)localized;
        return {};
    }

    // The parameter blocks this object keeps.
    virtual int NumParamBlocks() { return 0; }
    virtual IParamBlock2* GetParamBlock(int i) {
        (void)i;
        return nullptr;
    }
    // The block with this block ID among GetParamBlock(0..NumParamBlocks-1), or none.
    virtual IParamBlock2* GetParamBlockByID(short id);

    // An interface this object offers, or none.
    virtual BaseInterface* GetInterface(Interface_ID id) {
        (void)id;
        return nullptr;
    }

    // Frees the object; the default deletes it.
    virtual void DeleteThis() { delete this; }
};

} // namespace TrelmSDK

using TrelmSDK::Animatable;
