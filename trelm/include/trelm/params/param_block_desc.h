// Parameter block descriptors: the layout of a block, built from tagged lists.
#pragma once

#include <trelm/core/sdk_errors.h>
#include <trelm/params/param_def.h>

#include <concepts>
#include <type_traits>
#include <vector>

namespace TrelmSDK {

class ClassDesc2;
class ReferenceTarget;

// One element of a tagged list: a number, a text, a value of a parameter type, an accessor or a
// map. Tags are numbers; a raw literal such as 0xC0000019 is read as the tag of that value.
class TagArg {
public:
    using Value = std::variant<int64_t, double, MSTR, Point2, Point3, Point4, AColor, Matrix3,
                               PBAccessor*, ReferenceTarget*, std::nullptr_t>;
    template <class T>
    requires std::integral<T> || std::is_enum_v<T> TagArg(T v) : v_(static_cast<int64_t>(v)) {}
    template <std::floating_point T>
    TagArg(T v) : v_(static_cast<double>(v)) {}
    TagArg(const MCHAR* s) : v_(s ? MSTR(s) : MSTR()) {}
    TagArg(const MSTR& s) : v_(s) {}
    TagArg(const Point2& v) : v_(v) {}
    TagArg(const Point3& v) : v_(v) {}
    TagArg(const Point4& v) : v_(v) {}
    TagArg(const AColor& v) : v_(v) {}
    TagArg(const Matrix3& v) : v_(v) {}
    TagArg(PBAccessor* a) : v_(a) {}
    TagArg(ReferenceTarget* t) : v_(t) {}
    TagArg(std::nullptr_t) : v_(nullptr) {}
    const Value& value() const { return v_; }

private:
    Value v_;
};

// The layout of a parameter block: its ID, names, owner class, flags and parameters. Blocks keep
// a pointer to their descriptor, so a descriptor must outlive every block made from it, including
// blocks that only undo records still keep (clear the undo stacks before freeing a descriptor).
// Descriptors are built on the main thread (or at static initialisation) and only read afterwards;
// render threads may read them concurrently.
//
// The tagged list of the constructor, after the flags:
//   [version]              when flags has P_VERSION
//   [reference number]     when flags has P_AUTO_CONSTRUCT
//   then per parameter:    id, internal name, type, [table size when a table], flags,
//                          local name resource, tags with their arguments ..., p_end
//   and a final p_end (optional).
// Tags: p_default value; p_range low high; p_ui control [edit type, scale for spinners];
// p_accessor accessor; p_subtexno number; p_assetTypeID number; p_world_units.
// A malformed list is reported; the parameters before the fault are kept.
class ParamBlockDesc2 {
public:
    template <class... Args>
    ParamBlockDesc2(BlockID id, const MCHAR* int_name, StringResID local_name, ClassDesc2* cd,
                    int flags, Args&&... args)
        : ParamBlockDesc2(Header{}, id, int_name, local_name, cd, flags) {
        if constexpr (sizeof...(Args) > 0)
            ParseHeaderAndParams(std::vector<TagArg>{TagArg(std::forward<Args>(args))...});
        else
            ParseHeaderAndParams({});
    }
    ~ParamBlockDesc2();
    ParamBlockDesc2(const ParamBlockDesc2&) = delete;
    ParamBlockDesc2& operator=(const ParamBlockDesc2&) = delete;

    // Adds one parameter from its tagged list (internal name, type, [table size], flags, local
    // name, tags..., optional p_end). False (reported, nothing added) for a malformed list or an ID
    // already used.
    template <class... Args>
    bool AddParam(ParamID id, Args&&... args) {
        return ParseParam(id, std::vector<TagArg>{TagArg(std::forward<Args>(args))...});
    }
    // Adds a parameter described directly; the same checks apply.
    bool AddParam(const ParamDef& def);
    // Applies one tag with its arguments to an existing parameter.
    template <class... Args>
    bool ParamOption(ParamID id, uint32_t tag, Args&&... args) {
        return ParseOption(id, tag, std::vector<TagArg>{TagArg(std::forward<Args>(args))...});
    }
    bool DeleteParam(ParamID id);

    BlockID ID() const { return id_; }
    const MSTR& InternalName() const { return int_name_; }
    StringResID LocalNameID() const { return local_name_; }
    ClassDesc2* ClassDescriptor() const { return cd_; }
    int Flags() const { return flags_; }
    int Version() const { return version_; }
    int RefNo() const { return ref_no_; }

    int Count() const { return static_cast<int>(params_.size()); }
    // Parameter by index (descriptor order).
    const ParamDef& GetParamDefByIndex(int i) const { return params_[i]; }
    // Parameter by ID; none when unknown.
    const ParamDef* GetParamDef(ParamID id) const;
    int IDtoIndex(ParamID id) const;
    ParamID IndextoID(int index) const;
    // Index of the parameter with this internal name, or -1.
    int NameToIndex(const MSTR& int_name) const;
    // Local name: the accessor's for P_COMPUTED_NAME parameters, else the resource string of
    // local_name from the class descriptor's module (the internal name when there is none).
    MSTR GetLocalName(ParamID id, ReferenceMaker* owner = nullptr, int tabIndex = -1) const;
    // The descriptor's own local name (resource string), or its internal name.
    MSTR GetLocalName() const;

    // Bumped by every change of the parameter list, so blocks can follow it.
    unsigned Revision() const { return revision_; }

private:
    friend class ClassDesc2;
    struct Header {};
    ParamBlockDesc2(Header, BlockID id, const MCHAR* int_name, StringResID local_name,
                    ClassDesc2* cd, int flags);
    void ParseHeaderAndParams(const std::vector<TagArg>& args);
    bool ParseParam(ParamID id, const std::vector<TagArg>& args);
    bool ParseOption(ParamID id, uint32_t tag, const std::vector<TagArg>& args);
    void Fail(ParamID id, const MSTR& problem) const;

    BlockID id_;
    MSTR int_name_;
    StringResID local_name_;
    ClassDesc2* cd_;
    int flags_;
    int version_ = 0;
    int ref_no_ = -1;
    std::vector<ParamDef> params_;
    unsigned revision_ = 0;
};

} // namespace TrelmSDK

using TrelmSDK::ParamBlockDesc2;
