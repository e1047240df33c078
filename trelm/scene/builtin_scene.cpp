// The scene rendered when no scene file is given: a sphere standing on a plane.
#include <trelm/scene/bitmap_tex.h>
#include <trelm/scene/checker_tex.h>
#include <trelm/scene/gradient_tex.h>
#include <trelm/scene/primitives.h>
#include <trelm/scene/scene_file.h>

namespace TrelmSDK {

std::unique_ptr<Scene> MakeBuiltinScene(const std::string& texturePath) {
    auto scene = std::make_unique<Scene>();
    scene->settings.width = 640;
    scene->settings.height = 480;
    scene->camera.fov = 45.0f * float(M_PI / 180.0);
    scene->camera.LookAt(Point3(0, -6.5f, 3.2f), Point3(0, 0, 0.8f), Point3(0, 0, 1));

    Light sun;
    sun.direction = Point3(0.5f, 0.8f, -1.0f).normalized();
    sun.intensity = 1.1f;
    scene->lights.push_back(sun);
    Light fill;
    fill.kind = Light::POINT;
    fill.position = Point3(-4, -3, 4);
    fill.color = Color(0.6f, 0.7f, 1.0f);
    fill.intensity = 12.0f;
    fill.castShadows = false;
    scene->lights.push_back(fill);

    auto checker = std::make_shared<CheckerTex>();
    checker->SetName(L"Checker");
    checker->color1 = AColor(0.15f, 0.15f, 0.18f, 1);
    checker->color2 = AColor(0.85f, 0.85f, 0.8f, 1);
    checker->uvGen.uTiling = checker->uvGen.vTiling = 4;
    Material* floor = scene->CreateMaterial("Floor");
    floor->SetSubTexmap(Material::DIFFUSE_SLOT, scene->AddMap(checker));
    floor->specular = Color(0.05f, 0.05f, 0.05f);

    std::shared_ptr<MappedTexmap> ballMap;
    if (!texturePath.empty()) {
        auto bitmap = std::make_shared<BitmapTex>();
        bitmap->SetFileName(texturePath);
        bitmap->uvGen.uTiling = 2;
        ballMap = bitmap;
    } else {
        auto gradient = std::make_shared<GradientTex>();
        gradient->color1 = AColor(0.8f, 0.2f, 0.1f, 1);
        gradient->color2 = AColor(0.9f, 0.8f, 0.2f, 1);
        gradient->color3 = AColor(0.1f, 0.3f, 0.8f, 1);
        ballMap = gradient;
    }
    ballMap->SetName(L"BallMap");
    Material* ball = scene->CreateMaterial("Ball");
    ball->SetSubTexmap(Material::DIFFUSE_SLOT, scene->AddMap(ballMap));

    INode* plane = scene->CreateNode(L"Plane001");
    plane->SetObjectRef(std::make_shared<PlaneObject>(8.0f, 8.0f));
    plane->SetMtl(floor);
    plane->SetWireColor(0x00A0A0A0);

    INode* sphere = scene->CreateNode(L"Sphere001");
    sphere->SetObjectRef(std::make_shared<SphereObject>(1.0f));
    sphere->SetObjectTM(TransMatrix(Point3(0, 0, 1)));
    sphere->SetMtl(ball);
    sphere->SetWireColor(0x000000FF);
    sphere->SetGBufID(1);
    return scene;
}

} // namespace TrelmSDK
