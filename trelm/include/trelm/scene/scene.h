// The scene: nodes, materials, maps, lights, the active camera and the render settings, with
// the notifications the host sends about it.
#pragma once

#include <trelm/core/texmap.h>
#include <trelm/scene/camera.h>
#include <trelm/scene/light.h>
#include <trelm/scene/material.h>
#include <trelm/scene/node.h>
#include <trelm/scene/render_settings.h>

#include <memory>
#include <string>
#include <vector>

namespace TrelmSDK {

// Host notification codes sent about the scene, through BroadcastNotification on the main thread.
inline constexpr int NOTIFY_PRE_RENDER = 57;     // parameter: the RenderSettings about to render
inline constexpr int NOTIFY_NODES_CHANGED = 132; // parameter: a NodeChangeList

struct NodeChangeList {
    std::vector<INode*> nodes;
};

// Main-thread object; render threads read it while a render runs and no edit happens.
class Scene : public NodeChangeSink {
public:
    Scene() = default;
    Scene(const Scene&) = delete;
    Scene& operator=(const Scene&) = delete;
    ~Scene() override;

    // New node with a unique handle (from 1) and a render ID equal to its index.
    INode* CreateNode(const MSTR& name);
    INode* FindNode(const MSTR& name) const;
    INode* FindNodeByHandle(uint32_t handle) const;
    const std::vector<std::unique_ptr<INode>>& Nodes() const { return nodes_; }

    Material* CreateMaterial(const std::string& name);
    Material* FindMaterial(const std::string& name) const;
    const std::vector<std::unique_ptr<Material>>& Materials() const { return materials_; }

    // The scene keeps the map alive; materials and other maps refer to it by pointer.
    Texmap* AddMap(std::shared_ptr<Texmap> map);
    Texmap* FindMap(const std::string& utf8Name) const;
    const std::vector<std::shared_ptr<Texmap>>& Maps() const { return maps_; }

    ViewCamera camera;
    RenderSettings settings;
    std::vector<Light> lights;
    Color ambient{0.1f, 0.1f, 0.1f};

    // Broadcasts NOTIFY_NODES_CHANGED for the nodes changed since the last call, if any.
    void FlushNodeChanges();
    void NodeChanged(INode* node) override;

    // Brings objects and maps to time t; returns the interval over which the maps stay valid.
    Interval Update(TimeValue t);

private:
    std::vector<std::unique_ptr<INode>> nodes_;
    std::vector<std::unique_ptr<Material>> materials_;
    std::vector<std::shared_ptr<Texmap>> maps_;
    std::vector<INode*> changed_;
    uint32_t nextHandle_ = 1;
};

} // namespace TrelmSDK
