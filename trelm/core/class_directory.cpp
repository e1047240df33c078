// The host's class directory.
#include <trelm/core/class_directory.h>
#include <trelm/core/sdk_errors.h>

#include <algorithm>
#include <cstdio>

namespace TrelmSDK {

namespace detail {
// Lists the classes the SDK itself provides (controllers); defined beside them.
void AddBuiltInClasses(ClassDirectory& dir);
} // namespace detail

namespace {
MSTR Describe(SClass_ID sc, const Class_ID& id) {
    wchar_t buf[64];
    std::swprintf(buf, 64, L"(0x%X: 0x%X, 0x%X)", sc, id.PartA(), id.PartB());
    return buf;
}
} // namespace

bool ClassDirectory::AddClass(ClassDesc* cd) {
    if (!cd) {
        ReportSDKError(L"AddClass: no class descriptor given");
        return false;
    }
    if (FindClass(cd->SuperClassID(), cd->ClassID())) {
        ReportSDKError(L"AddClass: a class " + Describe(cd->SuperClassID(), cd->ClassID()) +
                       L" is listed already");
        return false;
    }
    classes_.push_back(cd);
    ++generation_;
    return true;
}

bool ClassDirectory::RemoveClass(ClassDesc* cd) {
    auto it = std::find(classes_.begin(), classes_.end(), cd);
    if (it == classes_.end()) return false;
    classes_.erase(it);
    ++generation_;
    return true;
}

ClassDesc* ClassDirectory::FindClass(SClass_ID superClass, const Class_ID& cid) const {
    for (auto* cd : classes_)
        if (cd->SuperClassID() == superClass && cd->ClassID() == cid) return cd;
    return nullptr;
}

ClassDesc* ClassDirectory::FindClassByInternalName(const MSTR& name) const {
    for (auto* cd : classes_)
        if (const MCHAR* n = cd->InternalName(); n && name == n) return cd;
    return nullptr;
}

ClassDesc* ClassDirectory::GetClassAt(int i) const {
    if (i < 0 || i >= Count()) {
        ReportSDKError(kTabRangeError);
        return nullptr;
    }
    return classes_[i];
}

std::vector<ClassDesc*> ClassDirectory::ClassesOfSuperClass(SClass_ID superClass) const {
    std::vector<ClassDesc*> out;
    for (auto* cd : classes_)
        if (cd->SuperClassID() == superClass) out.push_back(cd);
    return out;
}

std::vector<ClassDesc*> ClassDirectory::ClassesInCategory(const MSTR& category) const {
    std::vector<ClassDesc*> out;
    for (auto* cd : classes_)
        if (const MCHAR* c = cd->Category(); c && category == c) out.push_back(cd);
    return out;
}

ClassDirectory& GetClassDirectory() {
    static ClassDirectory* dir = [] {
        auto* d =
            new ClassDirectory; // descriptors of unloading modules may still remove themselves
        detail::AddBuiltInClasses(*d);
        return d;
    }();
    return *dir;
}

Animatable* CreateInstance(SClass_ID superClass, const Class_ID& cid) {
    ClassDesc* cd = GetClassDirectory().FindClass(superClass, cid);
    if (!cd) {
        ReportSDKError(L"CreateInstance: no class " + Describe(superClass, cid) + L" is listed");
        return nullptr;
    }
    if (!cd->OkToCreate()) {
        ReportSDKError(L"CreateInstance: class " + Describe(superClass, cid) +
                       L" refuses creation now");
        return nullptr;
    }
    return cd->Create(false);
}

} // namespace TrelmSDK
