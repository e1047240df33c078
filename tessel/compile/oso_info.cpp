// Building a shader description from OSO text through OSLQuery.
#include "compile/oso_info.h"

#include "compile/module_instance.h"
#include "compile/oslc_error_handler.h"

#include <OSL/oslquery.h>
#include <trelm/core/mstr.h>
#include <trelm/log/render_message_manager.h>
#include <trelm/log/system_log.h>
#include <trelm/params/class_desc2.h>

#include <locale>
#include <sstream>

namespace {

using Parameter = OSL::OSLQuery::Parameter;
using OSL::TypeDesc;

TrelmSDK::ClassDesc2* gShaderBlockOwner = nullptr; // main thread writes before use

// Text of a metadata item: ints, then floats, then the strings run together.
std::string MetadataText(const Parameter& item) {
    std::ostringstream out;
    out.imbue(std::locale::classic());
    for (size_t k = 0; k < item.idefault.size(); ++k) out << (k ? " " : "") << item.idefault[k];
    for (size_t k = 0; k < item.fdefault.size(); ++k) out << (k ? " " : "") << item.fdefault[k];
    for (const auto& s : item.sdefault) out << s.string();
    return out.str();
}

const Parameter* FindMeta(const Parameter& p, const char* name, TypeDesc::BASETYPE base) {
    const Parameter* found = nullptr;
    for (const Parameter& m : p.metadata)
        if (m.name == name && m.type.basetype == base) found = &m; // the later item wins
    return found;
}

std::string StringMeta(const Parameter& p, const char* name) {
    const Parameter* m = FindMeta(p, name, TypeDesc::STRING);
    return m && !m->sdefault.empty() ? m->sdefault[0].string() : std::string();
}

const int* IntMeta(const Parameter& p, const char* name) {
    const Parameter* m = FindMeta(p, name, TypeDesc::INT);
    return m && !m->idefault.empty() ? &m->idefault[0] : nullptr;
}

const float* FloatMeta(const Parameter& p, const char* name) {
    const Parameter* m = FindMeta(p, name, TypeDesc::FLOAT);
    return m && !m->fdefault.empty() ? &m->fdefault[0] : nullptr;
}

// The synthesised type of a struct the system treats as one value, or UNKNOWN.
TypeDesc FoldedStructType(const Parameter& p) {
    const std::string& s = p.structname.string();
    const int len = p.type.arraylen;
    if (s == "color2") return TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC2, TypeDesc::COLOR, len);
    if (s == "color4") return TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC4, TypeDesc::COLOR, len);
    if (s == "vector2") return TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC2, TypeDesc::VECTOR, len);
    if (s == "vector4") return TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC4, TypeDesc::VECTOR, len);
    if (s == "matrix33")
        return TypeDesc(TypeDesc::FLOAT, TypeDesc::MATRIX33, TypeDesc::VECTOR, len);
    return TypeDesc();
}

float FloatAt(const std::vector<float>& v, size_t k, float fallback = 0.0f) {
    return k < v.size() ? v[k] : fallback;
}

// What one OSL parameter becomes in the block; `fields` points at the folded struct's fields.
struct EntryPlan {
    int type = -1; // host parameter type without the table bit; -1: no entry
    PB2Value def;
    bool isString = false;
    bool hasRange = false;
    float low = 0, high = 0;
};

EntryPlan PlanEntry(const Parameter& p, const TypeDesc& t, const Parameter* fields, int format) {
    EntryPlan plan;
    const bool folded = fields != nullptr;
    auto floatRange = [&] {
        plan.hasRange = true;
        const float* lo = FloatMeta(p, "min");
        const float* hi = FloatMeta(p, "max");
        plan.low = lo ? *lo : -1e6f;
        plan.high = hi ? *hi : 1e6f;
    };
    if (t.basetype == TypeDesc::INT && t.aggregate == TypeDesc::SCALAR) {
        plan.type = TrelmSDK::TYPE_INT;
        plan.def = p.idefault.empty() ? 0 : p.idefault[0];
        const int* lo = IntMeta(p, "min");
        const int* hi = IntMeta(p, "max");
        plan.hasRange = true;
        plan.low = static_cast<float>(lo ? *lo : -1000000);
        plan.high = static_cast<float>(hi ? *hi : 1000000);
    } else if (t.basetype == TypeDesc::FLOAT && t.aggregate == TypeDesc::SCALAR) {
        const int* wu = IntMeta(p, "worldunits");
        plan.type = wu && *wu ? TrelmSDK::TYPE_WORLD : TrelmSDK::TYPE_FLOAT;
        plan.def = FloatAt(p.fdefault, 0);
        floatRange();
    } else if (t.basetype == TypeDesc::FLOAT && t.aggregate == TypeDesc::VEC2 && folded) {
        plan.type = TrelmSDK::TYPE_POINT2;
        plan.def = TrelmSDK::Point2(FloatAt(fields[0].fdefault, 0), FloatAt(fields[1].fdefault, 0));
        floatRange();
    } else if (t.basetype == TypeDesc::FLOAT && t.aggregate == TypeDesc::VEC3) {
        const auto& d = p.fdefault;
        if (t.vecsemantics == TypeDesc::COLOR) {
            plan.type = TrelmSDK::TYPE_FRGBA;
            plan.def = TrelmSDK::AColor(FloatAt(d, 0), FloatAt(d, 1), FloatAt(d, 2), 1.0f);
        } else {
            plan.type = TrelmSDK::TYPE_POINT3;
            plan.def = TrelmSDK::Point3(FloatAt(d, 0), FloatAt(d, 1), FloatAt(d, 2));
        }
        floatRange();
    } else if (t.basetype == TypeDesc::FLOAT && t.aggregate == TypeDesc::VEC4 && folded) {
        if (t.vecsemantics == TypeDesc::COLOR) {
            const auto& rgb = fields[0].fdefault;
            plan.type = TrelmSDK::TYPE_FRGBA;
            plan.def = TrelmSDK::AColor(FloatAt(rgb, 0), FloatAt(rgb, 1), FloatAt(rgb, 2),
                                        FloatAt(fields[1].fdefault, 0));
        } else {
            plan.type = TrelmSDK::TYPE_POINT4;
            plan.def =
                TrelmSDK::Point4(FloatAt(fields[0].fdefault, 0), FloatAt(fields[1].fdefault, 0),
                                 FloatAt(fields[2].fdefault, 0), FloatAt(fields[3].fdefault, 0));
        }
        floatRange();
    } else if (t.basetype == TypeDesc::FLOAT &&
               (t.aggregate == TypeDesc::MATRIX44 || t.aggregate == TypeDesc::MATRIX33)) {
        if (format < kShaderFormat20191) return plan;
        const auto& m = folded ? fields[0].fdefault : p.fdefault;
        auto row = [&](size_t r) {
            return TrelmSDK::Point3(FloatAt(m, 4 * r), FloatAt(m, 4 * r + 1),
                                    FloatAt(m, 4 * r + 2));
        };
        plan.type = TrelmSDK::TYPE_MATRIX3;
        plan.def = TrelmSDK::Matrix3(row(0), row(1), row(2), row(3));
    } else if (t.basetype == TypeDesc::STRING && t.aggregate == TypeDesc::SCALAR) {
        plan.isString = true;
        plan.type =
            StringMeta(p, "widget") == "filename" ? TrelmSDK::TYPE_FILENAME : TrelmSDK::TYPE_STRING;
        plan.def = TrelmSDK::FromUTF8(p.sdefault.empty() ? std::string() : p.sdefault[0].string());
    }
    return plan;
}

// Table size of an array entry.
int TableCount(const Parameter& p, const TypeDesc& t, const Parameter* fields) {
    if (!p.varlenarray && t.arraylen > 0) return t.arraylen;
    const Parameter& source = fields ? fields[0] : p;
    size_t values = source.idefault.size() + source.fdefault.size() + source.sdefault.size();
    const size_t aggregate = fields ? source.type.aggregate : t.aggregate;
    return static_cast<int>(values / (aggregate ? aggregate : 1));
}

} // namespace

void SetShaderBlockOwner(TrelmSDK::ClassDesc2* owner) {
    gShaderBlockOwner = owner;
}

TrelmSDK::ClassDesc2* ShaderBlockOwner() {
    return gShaderBlockOwner;
}

OSOInfo::OSOInfo(std::string text, SourceKey k, int format)
    : key(k), osoText(std::move(text)), saveFormat(format) {
    accessor = std::make_shared<PBOSLAccessor>(this);
    build();
}

OSOInfo::~OSOInfo() {
    accessor->Detach();
}

void OSOInfo::build() {
    OSL::OSLQuery query;
    if (!query.open_bytecode(osoText)) {
        SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_ERROR,
                                 "ERROR querying shader (" + query.geterror() + ")");
        return;
    }
    shaderName = query.shadername().string();
    blockDesc = std::make_shared<ParamBlockDesc2>(
        TrelmSDK::BlockID(1), TrelmSDK::FromUTF8(shaderName).c_str(), kShaderBlockResourceString,
        gShaderBlockOwner, TrelmSDK::P_AUTO_UI_QT | TrelmSDK::P_VERSION, saveFormat);

    for (const Parameter& item : query.metadata())
        metadata[""][item.name.string()] = MetadataText(item);
    for (const Parameter& p : query.parameters())
        for (const Parameter& item : p.metadata)
            metadata[p.name.string()][item.name.string()] = MetadataText(item);

    const size_t n = query.nparams();
    names.assign(2 * n, MSTR());
    labels.assign(2 * n, MSTR());
    types.assign(n, TypeDesc());
    const std::vector<Parameter>& params = query.parameters();
    PBAccessor* acc = accessor.get();
    const bool oldest = saveFormat <= kShaderFormat20190;

    // How many parameters index i spans (itself and a folded struct's fields) and whether it is
    // skipped in this format; a folded struct also yields its fields and synthesised type.
    struct Visit {
        size_t span = 1;
        bool skipped = false;
        const Parameter* fields = nullptr;
        TypeDesc type;
    };
    auto visit = [&](size_t i) {
        const Parameter& p = params[i];
        Visit v;
        v.type = p.type;
        const size_t nfields = p.isstruct ? p.fields.size() : 0;
        if (oldest && p.isstruct) return Visit{1 + nfields, true, nullptr, p.type};
        if (oldest && p.type.arraylen != 0) return Visit{1, true, nullptr, p.type};
        if (p.isstruct) {
            const TypeDesc folded = FoldedStructType(p);
            if (folded.basetype == TypeDesc::UNKNOWN || nfields == 0 || i + nfields >= n)
                return Visit{1, true, nullptr, p.type}; // its fields follow as parameters
            v.span = 1 + nfields;
            v.type = folded;
            v.fields = &params[i + 1];
        }
        return v;
    };

    for (size_t i = 0; i < n;) {
        const Parameter& p = params[i];
        const MSTR name = TrelmSDK::FromUTF8(p.name.string());
        names[i] = labels[i] = name;
        types[i] = p.type;
        const Visit v = visit(i);
        if (v.skipped) {
            i += v.span;
            continue;
        }
        types[i] = v.type;
        const std::string label = StringMeta(p, "label");
        if (!label.empty()) labels[i] = TrelmSDK::FromUTF8(label);
        if (p.isoutput) {
            outputIndices.push_back(static_cast<std::int32_t>(i));
            outputNames.push_back(name);
        } else if (p.validdefault || (v.fields && v.fields[0].validdefault)) {
            addValueEntry(p, v.type, v.fields, static_cast<TrelmSDK::ParamID>(i), acc);
        }
        i += v.span;
    }

    for (size_t i = 0; i < n;) {
        const Parameter& p = params[i];
        const Visit v = visit(i);
        if (!v.skipped && !p.isoutput) {
            const int* connectable = IntMeta(p, "connectable");
            if (!(connectable && *connectable == 0 && !oldest)) {
                names[n + i] = names[i] + L"_map";
                labels[n + i] = labels[i] + L" Map";
                const int subtex = static_cast<int>(mapNames.size());
                mapNames.push_back(names[n + i]);
                mapLabels.push_back(labels[n + i]);
                TrelmSDK::ParamDef def;
                def.ID = static_cast<TrelmSDK::ParamID>(n + i);
                def.int_name = names[n + i];
                def.type = TrelmSDK::TYPE_TEXMAP;
                def.flags = TrelmSDK::P_COMPUTED_NAME | TrelmSDK::P_SUBANIM;
                def.accessor = acc;
                def.sub_texmap = subtex;
                blockDesc->AddParam(def);
            }
        }
        i += v.span;
    }

    if (outputNames.empty()) {
        outputNames.push_back(kNoValidOutput);
        outputIndices.push_back(-1);
        const MSTR notice = ModuleString(kNoOutputResourceString, L"The shader has no output: ");
        TrelmSDK::GetRenderMessageManager().LogMessage(
            kOSLMessageSource, TrelmSDK::kType_Error, TrelmSDK::SYSLOG_ERROR,
            std::wstring_view(notice + TrelmSDK::FromUTF8(shaderName)));
    }
}

void OSOInfo::addValueEntry(const OSL::OSLQuery::Parameter& p, const OSL::TypeDesc& t,
                            const OSL::OSLQuery::Parameter* fields, TrelmSDK::ParamID id,
                            PBAccessor* acc) {
    const EntryPlan plan = PlanEntry(p, t, fields, saveFormat);
    if (plan.type < 0) return;
    const bool isArray = t.arraylen != 0;
    TrelmSDK::ParamDef def;
    def.ID = id;
    def.int_name = TrelmSDK::FromUTF8(p.name.string());
    def.type = plan.type | (isArray ? TrelmSDK::TYPE_TAB : 0);
    def.flags = plan.isString ? TrelmSDK::P_COMPUTED_NAME
                              : (TrelmSDK::P_COMPUTED_NAME | TrelmSDK::P_ANIMATABLE);
    if (isArray && p.varlenarray) def.flags |= TrelmSDK::P_VARIABLE_SIZE;
    if (isArray) def.tab_size = TableCount(p, t, fields);
    def.def = plan.def;
    def.accessor = acc;
    if (plan.hasRange) {
        def.has_range = true;
        def.range_low = plan.low;
        def.range_high = plan.high;
    }
    const int base = plan.type;
    if (base == TrelmSDK::TYPE_INT && !isArray) {
        const std::string widget = StringMeta(p, "widget");
        if (widget == "checkBox" || widget == "checkbox")
            def.ctrl_type = TrelmSDK::TYPE_SINGLECHECKBOX;
        else if (widget == "mapper")
            def.ctrl_type = TrelmSDK::TYPE_INT_COMBOBOX;
    } else if (base == TrelmSDK::TYPE_FLOAT || base == TrelmSDK::TYPE_WORLD) {
        const bool world = base == TrelmSDK::TYPE_WORLD;
        if (!isArray) {
            const float* step = FloatMeta(p, "step");
            def.ctrl_type = TrelmSDK::TYPE_SPINNER;
            def.edit_type = world ? TrelmSDK::EDITTYPE_UNIVERSE : TrelmSDK::EDITTYPE_FLOAT;
            def.scale = step ? *step : 0.01f;
        }
        def.world_units = world;
    } else if (base == TrelmSDK::TYPE_FILENAME) {
        def.asset_type = 1;
    }
    blockDesc->AddParam(def);
}
