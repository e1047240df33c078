// Building descriptors from tagged lists, and reading them.
#include <trelm/core/reference_target.h>
#include <trelm/params/class_desc2.h>
#include <trelm/params/param_block_desc.h>

#include <algorithm>
#include <cstdio>
#include <limits>
#include <optional>

namespace TrelmSDK {

namespace {
constexpr uint32_t kTagMask = 0xFFFFF000;
constexpr uint32_t kTagBase = 0xC0000000;

std::optional<int64_t> AsInt(const TagArg& a) {
    if (auto* i = std::get_if<int64_t>(&a.value())) return *i;
    return std::nullopt;
}

std::optional<double> AsNumber(const TagArg& a) {
    if (auto* i = std::get_if<int64_t>(&a.value())) return static_cast<double>(*i);
    if (auto* d = std::get_if<double>(&a.value())) return *d;
    return std::nullopt;
}

bool IsTag(const TagArg& a) {
    auto i = AsInt(a);
    return i && (static_cast<uint32_t>(*i) & kTagMask) == kTagBase;
}

bool IsTag(const TagArg& a, uint32_t tag) {
    auto i = AsInt(a);
    return i && static_cast<uint32_t>(*i) == tag;
}

MSTR Hex(uint32_t v) {
    wchar_t buf[16];
    std::swprintf(buf, 16, L"0x%X", v);
    return buf;
}

// The argument as a value of type's storage kind; empty when it is not one.
PB2Value ValueFor(const TagArg& a, int type) {
    const ParamType2 base = BaseType(type);
    PB2Value raw = std::visit(
        [&](const auto& x) -> PB2Value {
            using X = std::decay_t<decltype(x)>;
            if constexpr (std::is_same_v<X, int64_t>) {
                if (x < std::numeric_limits<int>::min() || x > std::numeric_limits<int>::max())
                    return {};
                return PB2Value(static_cast<int>(x));
            } else if constexpr (std::is_same_v<X, double>) {
                return PB2Value(static_cast<float>(x));
            } else if constexpr (std::is_same_v<X, std::nullptr_t>) {
                if (base == TYPE_TEXMAP) return PB2Value(static_cast<ReferenceTarget*>(nullptr));
                if (base == TYPE_STRING || base == TYPE_FILENAME) return PB2Value(MSTR());
                return {};
            } else if constexpr (std::is_same_v<X, ReferenceTarget*>) {
                // A map cannot be a default: blocks would share it without referencing it.
                return x ? PB2Value() : PB2Value(x);
            } else if constexpr (std::is_same_v<X, PBAccessor*>) {
                return {};
            } else {
                return PB2Value(x);
            }
        },
        a.value());
    return CoerceValue(raw, type);
}

bool IsNumericBase(ParamType2 t) {
    return t == TYPE_FLOAT || t == TYPE_WORLD || t == TYPE_INT || t == TYPE_BOOL ||
           t == TYPE_POINT2 || t == TYPE_POINT3 || t == TYPE_POINT4 || t == TYPE_FRGBA;
}

// Reads one argument; none when the list has ended.
const TagArg* Next(const std::vector<TagArg>& args, size_t& i) {
    return i < args.size() ? &args[i++] : nullptr;
}
} // namespace

ParamBlockDesc2::ParamBlockDesc2(Header, BlockID id, const MCHAR* int_name, StringResID local_name,
                                 ClassDesc2* cd, int flags)
    : id_(id), int_name_(int_name ? int_name : L""), local_name_(local_name), cd_(cd),
      flags_(flags) {
    if (cd_) {
        cd_->Attach(this);
        cd_->AddParamBlockDesc(this);
    }
}

ParamBlockDesc2::~ParamBlockDesc2() {
    if (cd_) cd_->Detach(this);
}

void ParamBlockDesc2::Fail(ParamID id, const MSTR& problem) const {
    MSTR where = L"ParamBlockDesc2 '" + int_name_ + L"'";
    if (id >= 0) where += L", parameter " + std::to_wstring(id);
    ReportSDKError(where + L": " + problem);
}

void ParamBlockDesc2::ParseHeaderAndParams(const std::vector<TagArg>& args) {
    size_t i = 0;
    if (flags_ & P_VERSION) {
        const TagArg* a = Next(args, i);
        auto v = a ? AsInt(*a) : std::nullopt;
        if (!v || IsTag(*a)) return Fail(-1, L"P_VERSION is set but no version number follows");
        version_ = static_cast<int>(*v);
    }
    if (flags_ & P_AUTO_CONSTRUCT) {
        const TagArg* a = Next(args, i);
        auto v = a ? AsInt(*a) : std::nullopt;
        if (!v || IsTag(*a) || *v < 0)
            return Fail(-1, L"P_AUTO_CONSTRUCT is set but no reference number follows");
        ref_no_ = static_cast<int>(*v);
    }
    while (i < args.size()) {
        const TagArg& a = args[i++];
        if (IsTag(a, p_end)) {
            if (i != args.size()) Fail(-1, L"arguments follow the final p_end");
            return;
        }
        auto id = AsInt(a);
        if (!id || IsTag(a) || *id < 0 || *id > std::numeric_limits<ParamID>::max())
            return Fail(-1, L"expected a parameter ID or p_end");
        // Parse up to and including this parameter's p_end.
        size_t end = i;
        while (end < args.size() && !IsTag(args[end], p_end)) ++end;
        std::vector<TagArg> spec(args.begin() + static_cast<ptrdiff_t>(i),
                                 args.begin() + static_cast<ptrdiff_t>(end));
        i = end < args.size() ? end + 1 : end;
        if (!ParseParam(static_cast<ParamID>(*id), spec)) return;
    }
}

bool ParamBlockDesc2::ParseParam(ParamID id, const std::vector<TagArg>& args) {
    if (id < 0) return Fail(id, L"parameter IDs must not be negative"), false;
    if (GetParamDef(id)) return Fail(id, L"the ID is used already"), false;
    ParamDef d;
    d.ID = id;
    size_t i = 0;
    const TagArg* a = Next(args, i);
    if (!a || !std::holds_alternative<MSTR>(a->value()))
        return Fail(id, L"expected the internal name"), false;
    d.int_name = std::get<MSTR>(a->value());
    a = Next(args, i);
    auto type = a ? AsInt(*a) : std::nullopt;
    if (!type || !IsKnownType(static_cast<int>(*type)))
        return Fail(id, L"expected a known parameter type"), false;
    d.type = static_cast<int>(*type);
    if (d.IsTab()) {
        a = Next(args, i);
        auto n = a ? AsInt(*a) : std::nullopt;
        if (!n || IsTag(*a) || *n < 0) return Fail(id, L"expected the table size"), false;
        d.tab_size = static_cast<int>(*n);
    }
    a = Next(args, i);
    auto flags = a ? AsInt(*a) : std::nullopt;
    if (!flags || IsTag(*a)) return Fail(id, L"expected the parameter flags"), false;
    d.flags = static_cast<int>(*flags);
    a = Next(args, i);
    auto local = a ? AsInt(*a) : std::nullopt;
    if (!local || IsTag(*a)) return Fail(id, L"expected the local name resource"), false;
    d.local_name = static_cast<int>(*local);
    d.def = ZeroValue(d.type);

    // Options go onto a copy that is added only when the whole list is good.
    params_.push_back(d);
    const size_t at = params_.size() - 1;
    bool ok = true;
    while (ok && i < args.size()) {
        const TagArg& t = args[i++];
        if (IsTag(t, p_end)) {
            if (i != args.size()) Fail(id, L"arguments follow p_end"), ok = false;
            break;
        }
        if (!IsTag(t)) {
            Fail(id, L"expected a tag");
            ok = false;
            break;
        }
        // Collect this tag's arguments: everything up to the next tag.
        size_t end = i;
        while (end < args.size() && !IsTag(args[end])) ++end;
        std::vector<TagArg> tagArgs(args.begin() + static_cast<ptrdiff_t>(i),
                                    args.begin() + static_cast<ptrdiff_t>(end));
        i = end;
        ok = ParseOption(id, static_cast<uint32_t>(*AsInt(t)), tagArgs);
    }
    if (!ok) {
        params_.erase(params_.begin() + static_cast<ptrdiff_t>(at));
        return false;
    }
    ++revision_;
    return true;
}

bool ParamBlockDesc2::AddParam(const ParamDef& def) {
    if (def.ID < 0) return Fail(def.ID, L"parameter IDs must not be negative"), false;
    if (GetParamDef(def.ID)) return Fail(def.ID, L"the ID is used already"), false;
    if (!IsKnownType(def.type)) return Fail(def.ID, L"unknown parameter type"), false;
    ParamDef d = def;
    if (d.def.IsEmpty()) d.def = ZeroValue(d.type);
    d.def = CoerceValue(d.def, d.type);
    if (d.def.IsEmpty()) return Fail(def.ID, L"the default is not of the parameter's type"), false;
    if (d.sub_texmap >= 0) d.flags |= P_SUBTEX;
    params_.push_back(std::move(d));
    ++revision_;
    return true;
}

bool ParamBlockDesc2::ParseOption(ParamID id, uint32_t tag, const std::vector<TagArg>& args) {
    auto it = std::find_if(params_.begin(), params_.end(),
                           [id](const ParamDef& d) { return d.ID == id; });
    if (it == params_.end()) return Fail(id, L"no parameter has this ID"), false;
    ParamDef d = *it;
    const ParamType2 base = BaseType(d.type);
    auto count = [&](size_t n) {
        if (args.size() == n) return true;
        Fail(id, L"tag " + Hex(tag) + L" takes " + std::to_wstring(n) + L" argument(s), got " +
                     std::to_wstring(args.size()));
        return false;
    };
    switch (tag) {
    case p_default: {
        if (!count(1)) return false;
        PB2Value v = ValueFor(args[0], d.type);
        if (v.IsEmpty()) return Fail(id, L"the default is not of the parameter's type"), false;
        d.def = v;
        break;
    }
    case p_range: {
        if (!count(2)) return false;
        if (!IsNumericBase(base)) return Fail(id, L"p_range needs a numeric type"), false;
        auto lo = AsNumber(args[0]), hi = AsNumber(args[1]);
        if (!lo || !hi) return Fail(id, L"p_range takes two numbers"), false;
        d.has_range = true;
        d.range_low = static_cast<float>(*lo);
        d.range_high = static_cast<float>(*hi);
        break;
    }
    case p_ui: {
        auto ctrl = args.empty() ? std::nullopt : AsInt(args[0]);
        if (!ctrl) return Fail(id, L"p_ui takes a control type"), false;
        d.ctrl_type = static_cast<int>(*ctrl);
        if (d.ctrl_type == TYPE_SPINNER) {
            if (args.size() != 3)
                return Fail(id, L"a spinner takes an edit type and a scale"), false;
            auto edit = AsInt(args[1]);
            auto scale = AsNumber(args[2]);
            if (!edit || !scale)
                return Fail(id, L"a spinner takes an edit type and a scale"), false;
            d.edit_type = static_cast<int>(*edit);
            d.scale = static_cast<float>(*scale);
        } else if (!count(1)) {
            return false;
        }
        break;
    }
    case p_accessor: {
        if (!count(1)) return false;
        if (auto* acc = std::get_if<PBAccessor*>(&args[0].value()))
            d.accessor = *acc;
        else if (std::holds_alternative<std::nullptr_t>(args[0].value()))
            d.accessor = nullptr;
        else
            return Fail(id, L"p_accessor takes a PBAccessor"), false;
        break;
    }
    case p_subtexno: {
        if (!count(1)) return false;
        auto n = AsInt(args[0]);
        if (base != TYPE_TEXMAP) return Fail(id, L"p_subtexno needs a texture map type"), false;
        if (!n || *n < 0) return Fail(id, L"p_subtexno takes a number"), false;
        d.sub_texmap = static_cast<int>(*n);
        d.flags |= P_SUBTEX;
        break;
    }
    case p_assetTypeID: {
        if (!count(1)) return false;
        auto n = AsInt(args[0]);
        if (!n) return Fail(id, L"p_assetTypeID takes a number"), false;
        d.asset_type = static_cast<int>(*n);
        break;
    }
    case p_world_units:
        if (!count(0)) return false;
        d.world_units = true;
        break;
    default:
        return Fail(id, L"unknown tag " + Hex(tag)), false;
    }
    *it = std::move(d);
    ++revision_;
    return true;
}

bool ParamBlockDesc2::DeleteParam(ParamID id) {
    auto it = std::find_if(params_.begin(), params_.end(),
                           [id](const ParamDef& d) { return d.ID == id; });
    if (it == params_.end()) return false;
    params_.erase(it);
    ++revision_;
    return true;
}

const ParamDef* ParamBlockDesc2::GetParamDef(ParamID id) const {
    int i = IDtoIndex(id);
    return i < 0 ? nullptr : &params_[i];
}

int ParamBlockDesc2::IDtoIndex(ParamID id) const {
    for (size_t i = 0; i < params_.size(); ++i)
        if (params_[i].ID == id) return static_cast<int>(i);
    return -1;
}

ParamID ParamBlockDesc2::IndextoID(int index) const {
    return index >= 0 && index < Count() ? params_[index].ID : ParamID(-1);
}

int ParamBlockDesc2::NameToIndex(const MSTR& int_name) const {
    for (size_t i = 0; i < params_.size(); ++i)
        if (params_[i].int_name == int_name) return static_cast<int>(i);
    return -1;
}

MSTR ParamBlockDesc2::GetLocalName(ParamID id, ReferenceMaker* owner, int tabIndex) const {
    const ParamDef* d = GetParamDef(id);
    if (!d) return {};
    if ((d->flags & P_COMPUTED_NAME) && d->accessor)
        return d->accessor->GetLocalName(owner, id, tabIndex);
    if (d->local_name && cd_)
        if (const MCHAR* s = GetResourceString(cd_->HInstance(), d->local_name)) return s;
    return d->int_name;
}

MSTR ParamBlockDesc2::GetLocalName() const {
    if (local_name_ && cd_)
        if (const MCHAR* s = GetResourceString(cd_->HInstance(), local_name_)) return s;
    return int_name_;
}

} // namespace TrelmSDK
