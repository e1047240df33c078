// OBJ reading, hierarchy building and ray intersection of triangle meshes.
#include <trelm/scene/tri_mesh.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <fstream>
#include <map>
#include <sstream>

namespace TrelmSDK {

namespace {

// Resolves an OBJ index (1-based, or negative counting back from the end) to 0-based; -1 when
// it points nowhere.
int ResolveIndex(long idx, size_t count) {
    if (idx > 0 && size_t(idx) <= count) return int(idx - 1);
    if (idx < 0 && size_t(-idx) <= count) return int(long(count) + idx);
    return -1;
}

bool SlabHit(const Box3& b, const Point3& o, const Point3& inv, float tmin, float tmax) {
    for (int i = 0; i < 3; ++i) {
        float t0 = (b.min[i] - o[i]) * inv[i], t1 = (b.max[i] - o[i]) * inv[i];
        if (t0 > t1) std::swap(t0, t1);
        tmin = t0 > tmin ? t0 : tmin;
        tmax = t1 < tmax ? t1 : tmax;
        if (tmin > tmax) return false;
    }
    return true;
}

} // namespace

std::unique_ptr<TriMesh> TriMesh::LoadOBJ(const std::string& path, std::string& error) {
    std::ifstream in(path);
    if (!in) {
        error = "cannot open mesh file '" + path + "'";
        return nullptr;
    }
    auto mesh = std::make_unique<TriMesh>();
    std::map<std::string, int> groups;
    int currentMtl = 0;
    std::string line;
    int lineNo = 0;
    auto fail = [&](const std::string& what) {
        error = path + ":" + std::to_string(lineNo) + ": " + what;
        return nullptr;
    };
    while (std::getline(in, line)) {
        ++lineNo;
        std::istringstream ls(line);
        std::string tag;
        if (!(ls >> tag) || tag[0] == '#') continue;
        if (tag == "v" || tag == "vn" || tag == "vt") {
            Point3 p(0);
            ls >> p.x >> p.y;
            if (!ls) return fail("expected numbers after '" + tag + "'");
            if (!(ls >> p.z)) {
                if (tag != "vt") return fail("expected three numbers after '" + tag + "'");
                p.z = 0;
            }
            (tag == "v" ? mesh->positions : tag == "vt" ? mesh->uvs : mesh->normals).push_back(p);
        } else if (tag == "f") {
            std::string item;
            std::vector<std::array<int, 3>> refs;
            while (ls >> item) {
                std::array<int, 3> r{-1, -1, -1};
                std::array<std::string, 3> parts;
                size_t s1 = item.find('/');
                parts[0] = item.substr(0, s1);
                if (s1 != std::string::npos) {
                    size_t s2 = item.find('/', s1 + 1);
                    parts[1] = item.substr(s1 + 1, s2 == std::string::npos ? s2 : s2 - s1 - 1);
                    if (s2 != std::string::npos) parts[2] = item.substr(s2 + 1);
                }
                const size_t counts[3] = {mesh->positions.size(), mesh->uvs.size(),
                                          mesh->normals.size()};
                for (int k = 0; k < 3; ++k) {
                    if (parts[k].empty()) {
                        if (k == 0) return fail("face corner '" + item + "' has no position");
                        continue;
                    }
                    char* end = nullptr;
                    long idx = std::strtol(parts[k].c_str(), &end, 10);
                    if (*end != 0) return fail("bad face corner '" + item + "'");
                    r[k] = ResolveIndex(idx, counts[k]);
                    if (r[k] < 0)
                        return fail("face corner '" + item + "' refers to a missing element");
                }
                refs.push_back(r);
            }
            if (refs.size() < 3) return fail("a face needs at least three corners");
            for (size_t i = 1; i + 1 < refs.size(); ++i) {
                Triangle t;
                const std::array<int, 3>* c[3] = {&refs[0], &refs[i], &refs[i + 1]};
                for (int k = 0; k < 3; ++k)
                    t.v[k] = (*c[k])[0], t.t[k] = (*c[k])[1], t.n[k] = (*c[k])[2];
                t.mtlNum = currentMtl;
                mesh->triangles.push_back(t);
            }
        } else if (tag == "usemtl") {
            std::string name;
            ls >> name;
            auto it = groups.emplace(name, int(groups.size())).first;
            currentMtl = it->second;
        }
        // Other statements (o, g, s, mtllib, ...) do not affect rendering here.
    }
    if (mesh->triangles.empty()) {
        error = path + ": the file has no faces";
        return nullptr;
    }
    if (!mesh->Build(error)) return nullptr;
    return mesh;
}

bool TriMesh::Build(std::string& error) {
    for (const Triangle& t : triangles)
        for (int k = 0; k < 3; ++k) {
            if (t.v[k] < 0 || size_t(t.v[k]) >= positions.size() ||
                (t.t[k] >= 0 && size_t(t.t[k]) >= uvs.size()) ||
                (t.n[k] >= 0 && size_t(t.n[k]) >= normals.size())) {
                error = "triangle refers to a missing vertex";
                return false;
            }
        }
    nodes_.clear();
    order_.resize(triangles.size());
    std::vector<Point3> centroids(triangles.size());
    for (size_t i = 0; i < triangles.size(); ++i) {
        order_[i] = int(i);
        const Triangle& t = triangles[i];
        centroids[i] = (positions[t.v[0]] + positions[t.v[1]] + positions[t.v[2]]) / 3.0f;
    }
    nodes_.reserve(2 * triangles.size());
    if (!triangles.empty()) BuildNode(0, int(triangles.size()), centroids);
    bound_ = nodes_.empty() ? Box3() : nodes_[0].box;
    return true;
}

int TriMesh::BuildNode(int begin, int end, std::vector<Point3>& centroids) {
    const int index = int(nodes_.size());
    nodes_.push_back({});
    Box3 box, cbox;
    for (int i = begin; i < end; ++i) {
        const Triangle& t = triangles[order_[i]];
        for (int k = 0; k < 3; ++k) box.extendBy(positions[t.v[k]]);
        cbox.extendBy(centroids[order_[i]]);
    }
    nodes_[index].box = box;
    if (end - begin <= 4) {
        nodes_[index].first = begin;
        nodes_[index].count = end - begin;
        return index;
    }
    // Median split along the widest axis of the centroids.
    const Point3 size = cbox.size();
    const int axis = size.x > size.y ? (size.x > size.z ? 0 : 2) : (size.y > size.z ? 1 : 2);
    const int mid = (begin + end) / 2;
    std::nth_element(order_.begin() + begin, order_.begin() + mid, order_.begin() + end,
                     [&](int a, int b) { return centroids[a][axis] < centroids[b][axis]; });
    // Depth-first layout: the left child follows its parent directly.
    BuildNode(begin, mid, centroids);
    const int right = BuildNode(mid, end, centroids);
    nodes_[index].count = 0;
    nodes_[index].right = right;
    return index;
}

bool TriMesh::IntersectTriangle(int tri, const Ray& ray, float tmin, float& tmax,
                                SurfaceHit& hit) const {
    // Moller-Trumbore.
    const Triangle& t = triangles[tri];
    const Point3 &p0 = positions[t.v[0]], &p1 = positions[t.v[1]], &p2 = positions[t.v[2]];
    const Point3 e1 = p1 - p0, e2 = p2 - p0;
    const Point3 pv = ray.dir.cross(e2);
    const float det = e1.dot(pv);
    if (std::fabs(det) < 1e-12f) return false;
    const float inv = 1.0f / det;
    const Point3 tv = ray.p - p0;
    const float b1 = tv.dot(pv) * inv;
    if (b1 < 0 || b1 > 1) return false;
    const Point3 qv = tv.cross(e1);
    const float b2 = ray.dir.dot(qv) * inv;
    if (b2 < 0 || b1 + b2 > 1) return false;
    const float d = e2.dot(qv) * inv;
    if (!(d > tmin && d < tmax)) return false;
    tmax = d;
    hit.t = d;
    FillHit(tri, b1, b2, hit);
    return true;
}

void TriMesh::FillHit(int tri, float b1, float b2, SurfaceHit& hit) const {
    const Triangle& t = triangles[tri];
    const Point3 &p0 = positions[t.v[0]], &p1 = positions[t.v[1]], &p2 = positions[t.v[2]];
    const float b0 = 1 - b1 - b2;
    hit.bary = Point3(b0, b1, b2);
    hit.p = p0 * b0 + p1 * b1 + p2 * b2;
    hit.ng = (p1 - p0).cross(p2 - p0).normalized();
    hit.n = hit.ng;
    if (t.n[0] >= 0 && t.n[1] >= 0 && t.n[2] >= 0) {
        const Point3 n = normals[t.n[0]] * b0 + normals[t.n[1]] * b1 + normals[t.n[2]] * b2;
        if (n.length2() > 0) hit.n = n.normalized();
    }
    hit.face = tri;
    hit.mtlNum = t.mtlNum;
    hit.dpdw = hit.ng;
    if (t.t[0] >= 0 && t.t[1] >= 0 && t.t[2] >= 0) {
        const Point3 &t0 = uvs[t.t[0]], &t1 = uvs[t.t[1]], &t2 = uvs[t.t[2]];
        hit.uvw = t0 * b0 + t1 * b1 + t2 * b2;
        // Solve [du1 dv1; du2 dv2] [dpdu; dpdv] = [e1; e2].
        const float du1 = t1.x - t0.x, dv1 = t1.y - t0.y, du2 = t2.x - t0.x, dv2 = t2.y - t0.y;
        const float det = du1 * dv2 - dv1 * du2;
        const Point3 e1 = p1 - p0, e2 = p2 - p0;
        if (std::fabs(det) > 1e-12f) {
            hit.dpdu = (e1 * dv2 - e2 * dv1) / det;
            hit.dpdv = (e2 * du1 - e1 * du2) / det;
            return;
        }
    } else {
        hit.uvw = Point3(b1, b2, 0);
    }
    // Without usable UVs, any tangent frame around the normal.
    const Point3 a = std::fabs(hit.ng.x) > 0.9f ? Point3(0, 1, 0) : Point3(1, 0, 0);
    hit.dpdu = hit.ng.cross(a).normalized();
    hit.dpdv = hit.ng.cross(hit.dpdu);
}

bool TriMesh::Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const {
    if (nodes_.empty()) return false;
    const Point3 inv(1.0f / ray.dir.x, 1.0f / ray.dir.y, 1.0f / ray.dir.z);
    int stack[64];
    int top = 0;
    stack[top++] = 0;
    bool found = false;
    while (top > 0) {
        const int self = stack[--top];
        const BVHNode& n = nodes_[self];
        if (!SlabHit(n.box, ray.p, inv, tmin, tmax)) continue;
        if (n.count > 0) {
            for (int i = n.first; i < n.first + n.count; ++i)
                found |= IntersectTriangle(order_[i], ray, tmin, tmax, hit);
        } else if (top + 2 <= 64) {
            stack[top++] = n.right;
            stack[top++] = self + 1;
        }
    }
    return found;
}

} // namespace TrelmSDK
