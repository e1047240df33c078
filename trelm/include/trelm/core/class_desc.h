// Class descriptors: how the host learns of a plug-in class, names it and creates its objects.
#pragma once

#include <trelm/core/animatable.h>
#include <trelm/core/resource_strings.h>

#include <vector>

namespace TrelmSDK {

// Describes one creatable class. Descriptors live as long as their module (usually statics).
class ClassDesc {
public:
    virtual ~ClassDesc() = default;

    // Whether users may create the class (it is listed in the browsers).
    virtual bool IsPublic() = 0;
    // A new object of the class; loading is true when the object is about to be read from a scene.
    virtual Animatable* Create(bool loading = false) = 0;
    virtual bool OkToCreate() { return true; }
    // The localised class name.
    virtual const MCHAR* ClassName() = 0;
    virtual const MCHAR* NonLocalizedClassName() { return ClassName(); }
    // The name scripts use; none when the class has no script name.
    virtual const MCHAR* InternalName() { return nullptr; }
    virtual SClass_ID SuperClassID() = 0;
    virtual Class_ID ClassID() = 0;
    // The localised category the browsers list the class under.
    virtual const MCHAR* Category() = 0;
    // The module that defines the class.
    virtual HINSTANCE HInstance() { return nullptr; }

    // Interfaces the class offers (function-published interfaces, mixins); not owned.
    void AddInterface(FPInterface* fpi);
    int NumInterfaces() const { return static_cast<int>(interfaces_.size()); }
    FPInterface* GetInterfaceAt(int i) const;
    virtual FPInterface* GetInterface(Interface_ID id);

private:
    std::vector<FPInterface*> interfaces_;
};

} // namespace TrelmSDK

using TrelmSDK::ClassDesc;
