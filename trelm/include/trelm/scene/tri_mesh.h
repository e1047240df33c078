// Triangle meshes with per-corner UVs and normals, read from OBJ files and intersected through
// a bounding volume hierarchy.
#pragma once

#include <trelm/scene/object.h>

#include <memory>
#include <string>
#include <vector>

namespace TrelmSDK {

class TriMesh : public Object {
public:
    struct Triangle {
        int v[3];       // positions
        int t[3];       // UVs, -1 when absent
        int n[3];       // normals, -1 when absent
        int mtlNum = 0; // index of the OBJ "usemtl" group, in order of first use
    };

    // Reads an OBJ file (v, vt, vn, f with polygons fanned into triangles, usemtl). Returns null
    // and sets error on failure.
    static std::unique_ptr<TriMesh> LoadOBJ(const std::string& path, std::string& error);
    // Builds from arrays; call Build() afterwards.
    TriMesh() = default;
    std::vector<Point3> positions;
    std::vector<Point3> uvs;
    std::vector<Point3> normals;
    std::vector<Triangle> triangles;
    // Validates indices and builds the hierarchy; false with error when an index is out of range.
    bool Build(std::string& error);

    std::string ClassName() const override { return "Mesh"; }
    bool Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const override;
    Box3 Bound() const override { return bound_; }

private:
    struct BVHNode {
        Box3 box;
        int first = 0, count = 0; // leaf: its triangles are order_[first, first + count)
        int right = -1;           // inner node (count 0): its left child is the next node
    };
    bool IntersectTriangle(int tri, const Ray& ray, float tmin, float& tmax, SurfaceHit& hit) const;
    void FillHit(int tri, float b1, float b2, SurfaceHit& hit) const;
    int BuildNode(int begin, int end, std::vector<Point3>& centroids);

    std::vector<BVHNode> nodes_;
    std::vector<int> order_;
    Box3 bound_;
};

} // namespace TrelmSDK
