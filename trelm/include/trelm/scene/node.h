// Scene nodes: an object placed in the world with its material, identifiers, wire colour and
// the user-defined properties a user types into the node's properties text.
#pragma once

#include <trelm/core/mstr.h>
#include <trelm/core/reference_target.h>
#include <trelm/scene/geom_types.h>

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace TrelmSDK {

class Object;
class Material;
class INode;

// Told when a node's data changes, so that the scene can report the node to listeners.
class NodeChangeSink {
public:
    virtual ~NodeChangeSink() = default;
    virtual void NodeChanged(INode* node) = 0;
};

// Super class of scene nodes.
inline constexpr SClass_ID BASENODE_SUPER_CLASS_ID = 0x0001;

// Written on the main thread; render threads read nodes while no edit happens. Every change is
// sent to the node's dependents (REFMSG_CHANGE) and reported to its change sink.
class INode : public ReferenceTarget {
public:
    INode(MSTR name, uint32_t handle) : name_(std::move(name)), handle_(handle) {}
    SClass_ID SuperClassID() const override { return BASENODE_SUPER_CLASS_ID; }

    const MSTR& GetName() const { return name_; }
    void SetName(MSTR name) { name_ = std::move(name), Changed(PART_ALL); }
    uint32_t GetHandle() const { return handle_; }

    int GetRenderID() const { return renderID_; }
    void SetRenderID(int id) { renderID_ = id, Changed(PART_ALL); }
    int GetGBufID() const { return gbufID_; }
    void SetGBufID(int id) { gbufID_ = id, Changed(PART_ALL); }
    // 0x00BBGGRR: red in the lowest byte.
    uint32_t GetWireColor() const { return wireColor_; }
    void SetWireColor(uint32_t c) { wireColor_ = c, Changed(PART_ALL); }

    // The user properties text: one "key = value" per line, as typed.
    const MSTR& GetUserPropBuffer() const { return userProps_; }
    void SetUserPropBuffer(MSTR text) { userProps_ = std::move(text), Changed(PART_ALL); }
    // The value text of a key (keys compare without regard to case); false when absent.
    bool GetUserPropString(const MSTR& key, MSTR& value) const;
    bool UserPropExists(const MSTR& key) const;
    // Every key and value in the order typed, trimmed; lines without '=' are not properties.
    std::vector<std::pair<MSTR, MSTR>> GetUserProps() const;

    // Object to world.
    const Matrix3& GetObjectTM() const { return objectTM_; }
    void SetObjectTM(const Matrix3& tm) { objectTM_ = tm, Changed(PART_TM); }

    Object* GetObjectRef() const { return object_.get(); }
    void SetObjectRef(std::shared_ptr<Object> obj) {
        object_ = std::move(obj), Changed(PART_GEOM | PART_TOPO);
    }
    Material* GetMtl() const { return mtl_; }
    void SetMtl(Material* m) { mtl_ = m, Changed(PART_MTL); }

    bool Renderable() const { return renderable_; }
    void SetRenderable(bool on) { renderable_ = on, Changed(PART_ALL); }

    void SetChangeSink(NodeChangeSink* sink) { sink_ = sink; }

private:
    void Changed(PartID part) {
        NotifyDependents(FOREVER, part, REFMSG_CHANGE);
        if (sink_) sink_->NodeChanged(this);
    }
    MSTR name_;
    uint32_t handle_;
    int renderID_ = 0;
    int gbufID_ = 0;
    uint32_t wireColor_ = 0x00808080;
    MSTR userProps_;
    Matrix3 objectTM_;
    std::shared_ptr<Object> object_;
    Material* mtl_ = nullptr;
    bool renderable_ = true;
    NodeChangeSink* sink_ = nullptr;
};

} // namespace TrelmSDK
