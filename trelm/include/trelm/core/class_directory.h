// The host's directory of known classes: descriptors by super class and class ID.
#pragma once

#include <trelm/core/class_desc.h>

#include <vector>

namespace TrelmSDK {

// Every class the host knows: its built-in classes and those of loaded modules, including classes
// added while the host runs. Descriptors are not owned and must outlive their entry. Main thread
// only (a background thread hands additions to the main-thread task queue).
class ClassDirectory {
public:
    // Adds cd; refused (false, reported) when cd is none or a class with the same super class and
    // class ID is listed already.
    bool AddClass(ClassDesc* cd);
    // Removes cd; false when it is not listed.
    bool RemoveClass(ClassDesc* cd);
    ClassDesc* FindClass(SClass_ID superClass, const Class_ID& cid) const;
    // The first class with this internal (script) name, or none.
    ClassDesc* FindClassByInternalName(const MSTR& name) const;
    int Count() const { return static_cast<int>(classes_.size()); }
    // Class i in the order added; none (reported) for an index out of range.
    ClassDesc* GetClassAt(int i) const;
    std::vector<ClassDesc*> ClassesOfSuperClass(SClass_ID superClass) const;
    std::vector<ClassDesc*> ClassesInCategory(const MSTR& category) const;
    // Bumped by every change, so lists built from the directory can tell they are stale.
    unsigned Generation() const { return generation_; }

private:
    std::vector<ClassDesc*> classes_;
    unsigned generation_ = 0;
};

// The host's directory; built-in classes (controllers) are listed on first use.
ClassDirectory& GetClassDirectory();

// A new object of the listed class (its descriptor's Create), or none (reported) when the class
// is not listed or refuses creation.
Animatable* CreateInstance(SClass_ID superClass, const Class_ID& cid);

} // namespace TrelmSDK

using TrelmSDK::ClassDirectory;
using TrelmSDK::CreateInstance;
using TrelmSDK::GetClassDirectory;
