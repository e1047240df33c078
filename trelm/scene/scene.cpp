// Scene contents, change tracking of nodes and the update before rendering.
#include <trelm/core/notifications.h>
#include <trelm/scene/object.h>
#include <trelm/scene/scene.h>

#include <algorithm>

namespace TrelmSDK {

INode* Scene::CreateNode(const MSTR& name) {
    auto node = std::make_unique<INode>(name, nextHandle_++);
    node->SetRenderID(int(nodes_.size()));
    node->SetChangeSink(this);
    nodes_.push_back(std::move(node));
    return nodes_.back().get();
}

INode* Scene::FindNode(const MSTR& name) const {
    for (auto& n : nodes_)
        if (n->GetName() == name) return n.get();
    return nullptr;
}

INode* Scene::FindNodeByHandle(uint32_t handle) const {
    for (auto& n : nodes_)
        if (n->GetHandle() == handle) return n.get();
    return nullptr;
}

Material* Scene::CreateMaterial(const std::string& name) {
    materials_.push_back(std::make_unique<Material>());
    materials_.back()->name = name;
    return materials_.back().get();
}

Material* Scene::FindMaterial(const std::string& name) const {
    for (auto& m : materials_)
        if (m->name == name) return m.get();
    return nullptr;
}

Texmap* Scene::AddMap(std::shared_ptr<Texmap> map) {
    maps_.push_back(std::move(map));
    return maps_.back().get();
}

Texmap* Scene::FindMap(const std::string& name) const {
    for (auto& m : maps_)
        if (ToUTF8(m->GetName()) == name) return m.get();
    return nullptr;
}

void Scene::NodeChanged(INode* node) {
    if (std::find(changed_.begin(), changed_.end(), node) == changed_.end())
        changed_.push_back(node);
}

void Scene::FlushNodeChanges() {
    if (changed_.empty()) return;
    NodeChangeList list{std::move(changed_)};
    changed_.clear();
    BroadcastNotification(NOTIFY_NODES_CHANGED, &list);
}

Interval Scene::Update(TimeValue t) {
    for (auto& n : nodes_)
        if (Object* obj = n->GetObjectRef()) obj->Update(t);
    Interval valid = FOREVER;
    for (auto& m : maps_) m->Update(t, valid);
    return valid;
}

} // namespace TrelmSDK
