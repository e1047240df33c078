#include <trelm/core/notifications.h>
#include <trelm/scene/active_scene.h>
#include <trelm/scene/scene.h>

#include <gtest/gtest.h>

using namespace TrelmSDK;

TEST(INode, UserPropertiesAreReadAsTyped) {
    Scene scene;
    INode* node = scene.CreateNode(L"Box001");
    node->SetUserPropBuffer(
        L"gain = 0.5\r\n  Count=12\nnot a property\n=orphan\ntint = [1, 0.5, 0]\n");
    MSTR value;
    ASSERT_TRUE(node->GetUserPropString(L"gain", value));
    EXPECT_EQ(value, L"0.5");
    ASSERT_TRUE(node->GetUserPropString(L"COUNT", value)); // keys ignore case
    EXPECT_EQ(value, L"12");
    ASSERT_TRUE(node->GetUserPropString(L"tint", value));
    EXPECT_EQ(value, L"[1, 0.5, 0]");
    EXPECT_FALSE(node->GetUserPropString(L"not a property", value));
    EXPECT_FALSE(node->UserPropExists(L"missing"));
    const auto props = node->GetUserProps();
    ASSERT_EQ(props.size(), 3u);
    EXPECT_EQ(props[1].first, L"Count");
}

TEST(Scene, NodesGetUniqueHandlesAndRenderIDs) {
    Scene scene;
    INode* a = scene.CreateNode(L"A");
    INode* b = scene.CreateNode(L"B");
    EXPECT_NE(a->GetHandle(), b->GetHandle());
    EXPECT_NE(a->GetHandle(), 0u);
    EXPECT_EQ(a->GetRenderID(), 0);
    EXPECT_EQ(b->GetRenderID(), 1);
    EXPECT_EQ(scene.FindNode(L"B"), b);
    EXPECT_EQ(scene.FindNodeByHandle(a->GetHandle()), a);
    EXPECT_EQ(scene.FindNode(L"C"), nullptr);
}

namespace {

struct Heard {
    std::vector<std::vector<INode*>> changes;
};

void OnNodesChanged(void* param, NotifyInfo* info) {
    auto* list = static_cast<NodeChangeList*>(info->callParam);
    static_cast<Heard*>(param)->changes.push_back(list->nodes);
}

} // namespace

TEST(Scene, ChangedNodesAreBroadcastOnceEach) {
    Scene scene;
    INode* a = scene.CreateNode(L"A");
    INode* b = scene.CreateNode(L"B");
    scene.FlushNodeChanges(); // creation counts as a change; start afresh
    Heard heard;
    ASSERT_TRUE(RegisterNotification(OnNodesChanged, &heard, NOTIFY_NODES_CHANGED));
    a->SetWireColor(0x0000FF);
    a->SetObjectTM(TransMatrix(Point3(1, 2, 3)));
    b->SetGBufID(4);
    scene.FlushNodeChanges();
    scene.FlushNodeChanges(); // nothing new: no second broadcast
    UnRegisterNotification(OnNodesChanged, &heard, NOTIFY_NODES_CHANGED);
    ASSERT_EQ(heard.changes.size(), 1u);
    EXPECT_EQ(heard.changes[0], (std::vector<INode*>{a, b}));
}

TEST(Matrix, RotationsComposeAsRowVectors) {
    const Matrix3 rz = RotateXYZMatrix(Point3(0, 0, 90));
    const Point3 p = rz.PointTransform(Point3(1, 0, 0));
    EXPECT_NEAR(p.x, 0, 1e-6f);
    EXPECT_NEAR(p.y, 1, 1e-6f);
    const Matrix3 m = ScaleMatrix(Point3(2, 2, 2)) * rz * TransMatrix(Point3(0, 0, 5));
    const Point3 q = m.PointTransform(Point3(1, 0, 0));
    EXPECT_NEAR(q.x, 0, 1e-5f);
    EXPECT_NEAR(q.y, 2, 1e-5f);
    EXPECT_NEAR(q.z, 5, 1e-5f);
    const Point3 back = Inverse(m).PointTransform(q);
    EXPECT_NEAR(back.x, 1, 1e-5f);
    EXPECT_NEAR(back.y, 0, 1e-5f);
    EXPECT_NEAR(back.z, 0, 1e-5f);
}

TEST(ActiveScene, RegionInterfaceAnswersFromTheActiveScene) {
    auto scene = std::make_unique<Scene>();
    scene->settings.region = {0.1f, 0.2f, 0.6f, 0.9f};
    SetActiveScene(scene.get());
    EXPECT_EQ(GetActiveScene(), scene.get());
    auto* region = dynamic_cast<IRenderRegion*>(GetCOREInterface(RENDER_REGION_INTERFACE_ID));
    ASSERT_TRUE(region);
    float x0, y0, x1, y1;
    ASSERT_TRUE(region->GetRegion(x0, y0, x1, y1));
    EXPECT_EQ(x0, 0.1f);
    EXPECT_EQ(y1, 0.9f);
    scene.reset(); // a deleted scene is no longer active
    EXPECT_EQ(GetActiveScene(), nullptr);
    EXPECT_FALSE(region->GetRegion(x0, y0, x1, y1));
}
