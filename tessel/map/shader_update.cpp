// UpdateShader, RebuildShaderBlock, CopyShaderParams, InitArrayDefaults and ResetShaderParams:
// how a map follows its code while keeping what the user set on its inputs.
#include "map/shader_update.h"

#include "compile/compiled_shader_registry.h"
#include "compile/oslc_error_handler.h"
#include "map/osl_tex.h"
#include "map/osl_tex_class_desc.h"
#include "map/shader_block_restore.h"
#include "runtime/shading_system.h"

#include <OSL/oslquery.h>
#include <trelm/core/class_directory.h>
#include <trelm/core/hold.h>
#include <trelm/core/locale_guard.h>
#include <trelm/params/expression_control.h>

using namespace TrelmSDK;

namespace {

void ReportError(const std::string& text) {
    SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_ERROR, text);
}

// Keeps a block from deleting itself while it is being replaced.
class BlockKeeper {
public:
    explicit BlockKeeper(IParamBlock2* block) : block_(block) {
        if (block_) block_->HoldLock();
    }
    ~BlockKeeper() {
        if (block_) block_->HoldUnlock();
    }
    BlockKeeper(const BlockKeeper&) = delete;
    BlockKeeper& operator=(const BlockKeeper&) = delete;

private:
    IParamBlock2* block_;
};

// Gives parameters with "timeValue" metadata a float expression controller running on frames
// (integers) or seconds (floats).
void AssignTimeValueControllers(IParamBlock2* block, SourceKey key) {
    CompiledShaderRegistry& registry = CompiledShaderRegistry::Instance();
    for (int i = 0; i < block->NumParams(); ++i) {
        const ParamDef& def = block->GetDesc()->GetParamDefByIndex(i);
        if (def.type != TYPE_FLOAT && def.type != TYPE_INT) continue;
        if (registry.MetadataValue(key, ToUTF8(def.int_name), "timeValue").empty()) continue;
        auto* ctrl = dynamic_cast<Control*>(
            CreateInstance(CTRL_FLOAT_CLASS_ID, EXPR_FLOAT_CONTROL_CLASS_ID));
        auto* expr =
            ctrl ? dynamic_cast<IExprCtrl*>(ctrl->GetInterface(IID_EXPR_CONTROL)) : nullptr;
        if (!expr) {
            if (ctrl) ctrl->DeleteMe();
            std::string message = "No expression controller for the timeValue input ";
            ReportError(message.append(ToUTF8(def.int_name)));
            continue;
        }
        const bool reportErrors = expr->GetReportErrors();
        expr->SetReportErrors(false);
        expr->SetExpression(def.type == TYPE_INT ? L"F" : L"S");
        expr->SetReportErrors(reportErrors);
        if (!block->SetController(def.ID, 0, ctrl)) ctrl->DeleteMe();
    }
}

// Copies one element's value; false when the type has no copy rule.
bool CopyElementValue(IParamBlock2* from, ParamID fromId, IParamBlock2* to, ParamID toId,
                      int baseType, int k) {
    Interval valid = FOREVER;
    auto copy = [&](auto value) {
        if (from->GetValue(fromId, 0, value, valid, k)) to->SetValue(toId, 0, value, k);
    };
    switch (baseType) {
    case TYPE_FLOAT:
    case TYPE_WORLD:
        copy(0.0f);
        return true;
    case TYPE_INT:
        copy(0);
        return true;
    case TYPE_POINT3:
        copy(Point3(0, 0, 0));
        return true;
    case TYPE_STRING:
    case TYPE_FILENAME:
        copy(MSTR());
        return true;
    case TYPE_TEXMAP:
        copy(static_cast<ReferenceTarget*>(nullptr));
        return true;
    case TYPE_MATRIX3:
        copy(Matrix3());
        return true;
    case TYPE_POINT4:
        copy(Point4(0, 0, 0, 0));
        return true;
    case TYPE_FRGBA:
        copy(AColor(0, 0, 0, 1));
        return true;
    case TYPE_POINT2:
        copy(Point2(0, 0));
        return true;
    default:
        return false;
    }
}

float FloatAt(const std::vector<float>& v, size_t k) {
    return k < v.size() ? v[k] : 0.0f;
}

} // namespace

bool UpdateShader(OSLTex& map, bool loading) {
    LocaleGuard cLocale("C");
    CompiledShaderRegistry& registry = CompiledShaderRegistry::Instance();
    map.shadingSystem_ = GetShadingSystem(registry);
    if (!map.fixedBlock_) return false;

    ShaderBlockRestore* record =
        map.blockSwapUndoable_ && theHold.Holding() ? new ShaderBlockRestore(map) : nullptr;
    const std::string code = ToUTF8(map.fixedBlock_->GetStr(kOSLCode, 0));
    const SourceKey key = registry.SourceKeyOf(code);
    map.key_ = key;

    if (!registry.Contains(key)) registry.Compile(code, nullptr, std::wstring());
    std::shared_ptr<ParamBlockDesc2> desc = registry.Find(key);
    std::shared_ptr<const OSOInfo> info = registry.Description(key);
    if (!desc || !info) {
        delete record;
        return false;
    }
    map.shaderName_ = FromUTF8(registry.RecordedShaderName(key));

    bool redescribed = false;
    if (loading && map.shaderBlock_) {
        std::shared_ptr<ParamBlockDesc2> savedDesc = desc;
        if (map.savedFormat_ < kShaderFormatCurrent) {
            savedDesc = registry.DescriptorForVersion(key, map.savedFormat_);
        } else if (map.savedFormat_ > kShaderFormatCurrent) {
            std::string message = "Save format for shader ";
            message.append(ToUTF8(map.shaderName_))
                .append(" is newer than this trelm version!! Potential loss of data!!\n");
            ReportError(message);
        }
        if (savedDesc) redescribed = map.shaderBlock_->Redescribe(savedDesc.get());
    }

    // A block just read or cloned is rebuilt in the current layout even under the same descriptor.
    if (map.currentDesc_ == desc && !redescribed) {
        delete record;
        return true;
    }
    map.currentDesc_ = desc;
    map.currentInfo_ = info;
    RebuildShaderBlock(map, map.shaderBlock_, desc, key, false);

    map.outputNames_ = info->outputNames;
    if (record) {
        record->CaptureAfter(map);
        theHold.Put(record);
    }
    return true;
}

void RebuildShaderBlock(OSLTex& map, IParamBlock2* oldBlock, std::shared_ptr<ParamBlockDesc2> desc,
                        SourceKey key, bool skipValues) {
    BlockKeeper keepOld(oldBlock);
    theHold.Suspend();
    IParamBlock2* block = CreateParameterBlock2(desc.get(), &map);
    if (block) {
        InitArrayDefaults(key, block);
        AssignTimeValueControllers(block, key);
        CopyShaderParams(oldBlock, block, skipValues);
        if (map.ReplaceReference(2, block) != REF_SUCCEED) block->DeleteMe();
    }
    theHold.Resume();
    map.ivalid_.SetEmpty();
}

bool CopyShaderParams(IParamBlock2* oldBlock, IParamBlock2* newBlock, bool skipValues) {
    if (!oldBlock || !newBlock) return false;
    if (oldBlock->GetDesc()->InternalName().empty() || newBlock->NumParams() == 0) return false;
    if (oldBlock == newBlock) return true;

    for (int i = 0; i < newBlock->NumParams(); ++i) {
        const ParamDef& def = newBlock->GetDesc()->GetParamDefByIndex(i);
        const int oldIndex = oldBlock->GetDesc()->NameToIndex(def.int_name);
        if (oldIndex < 0) continue;
        const ParamID oldId = oldBlock->IndextoID(oldIndex);
        if (oldBlock->GetParameterType(oldId) != def.type) continue;
        const ParamDef& oldDef = oldBlock->GetDesc()->GetParamDefByIndex(oldIndex);
        const int base = BaseType(def.type);
        const bool isMap = base == TYPE_TEXMAP;

        if (def.IsTab() && (!skipValues || isMap))
            newBlock->SetCount(def.ID, oldBlock->Count(oldId));
        const int count = std::min(oldBlock->Count(oldId), newBlock->Count(def.ID));
        for (int k = 0; k < count; ++k) {
            bool driven = false;
            if (!isMap && oldDef.IsAnimatable()) {
                if (Control* c = oldBlock->GetController(oldId, k)) {
                    newBlock->SetController(def.ID, k, c);
                    driven = true;
                }
            }
            if (skipValues && !isMap) continue;
            // A controller supplies the value of a driven element; writing one would key it.
            if (driven || (!isMap && newBlock->GetController(def.ID, k))) continue;
            if (!CopyElementValue(oldBlock, oldId, newBlock, def.ID, base, k))
                ReportError("Unhandled data type in param copying");
        }
    }
    return true;
}

void InitArrayDefaults(SourceKey key, IParamBlock2* block) {
    if (!block) return;
    bool hasTables = false;
    for (int i = 0; i < block->NumParams(); ++i)
        hasTables = hasTables || block->GetDesc()->GetParamDefByIndex(i).IsTab();
    if (!hasTables) return;

    ::OSL::OSLQuery query;
    if (!query.open_bytecode(CompiledShaderRegistry::Instance().CompiledText(key))) {
        ReportError("ERROR querying shader (" + query.geterror() + ")");
        return;
    }
    using Parameter = ::OSL::OSLQuery::Parameter;
    for (int i = 0; i < block->NumParams(); ++i) {
        const ParamDef& def = block->GetDesc()->GetParamDefByIndex(i);
        if (!def.IsTab()) continue;
        const size_t index = static_cast<size_t>(def.ID);
        const Parameter* p = query.getparam(index);
        if (!p) continue;
        auto field = [&](size_t f) -> const std::vector<float>& {
            static const std::vector<float> none;
            const Parameter* fp = query.getparam(index + f);
            return fp ? fp->fdefault : none;
        };
        const int count = block->Count(def.ID);
        auto fill = [&](size_t n, auto valueAt) {
            for (size_t k = 0; k < n && static_cast<int>(k) < count; ++k)
                block->SetValue(def.ID, 0, valueAt(k), static_cast<int>(k));
        };
        switch (def.type) {
        case TYPE_FLOAT_TAB:
        case TYPE_WORLD_TAB:
            fill(p->fdefault.size(), [&](size_t k) { return p->fdefault[k]; });
            break;
        case TYPE_INT_TAB:
            fill(p->idefault.size(), [&](size_t k) { return p->idefault[k]; });
            break;
        case TYPE_POINT3_TAB: {
            const auto& d = p->fdefault;
            fill(d.size() / 3,
                 [&](size_t k) { return Point3(d[3 * k], d[3 * k + 1], d[3 * k + 2]); });
            break;
        }
        case TYPE_STRING_TAB:
        case TYPE_FILENAME_TAB:
            fill(p->sdefault.size(), [&](size_t k) { return FromUTF8(p->sdefault[k].string()); });
            break;
        case TYPE_MATRIX3_TAB: {
            const auto& d = p->isstruct ? field(1) : p->fdefault;
            fill(d.size() / 16, [&](size_t k) {
                auto row = [&](size_t r) {
                    const size_t at = 16 * k + 4 * r;
                    return Point3(d[at], d[at + 1], d[at + 2]);
                };
                return Matrix3(row(0), row(1), row(2), row(3));
            });
            break;
        }
        case TYPE_POINT4_TAB: {
            const auto &x = field(1), &y = field(2), &z = field(3), &w = field(4);
            fill(std::min({x.size(), y.size(), z.size(), w.size()}),
                 [&](size_t k) { return Point4(x[k], y[k], z[k], w[k]); });
            break;
        }
        case TYPE_FRGBA_TAB:
            if (p->isstruct) {
                const auto &rgb = field(1), &alpha = field(2);
                fill(std::min(rgb.size() / 3, alpha.size()), [&](size_t k) {
                    return AColor(rgb[3 * k], rgb[3 * k + 1], rgb[3 * k + 2], alpha[k]);
                });
            } else {
                const auto& d = p->fdefault;
                fill(d.size() / 3,
                     [&](size_t k) { return AColor(d[3 * k], d[3 * k + 1], d[3 * k + 2], 1.0f); });
            }
            break;
        case TYPE_POINT2_TAB: {
            const auto &x = field(1), &y = field(2);
            fill(std::min(x.size(), y.size()),
                 [&](size_t k) { return Point2(FloatAt(x, k), FloatAt(y, k)); });
            break;
        }
        default:
            ReportError("Unhandled data type in array default init");
            break;
        }
    }
}

void ResetShaderParams(OSLTex& map) {
    CompiledShaderRegistry& registry = CompiledShaderRegistry::Instance();
    if (!map.shaderBlock_ || !map.currentDesc_ || !registry.Contains(map.key_)) return;
    ShaderBlockRestore* record = theHold.Holding() ? new ShaderBlockRestore(map) : nullptr;
    RebuildShaderBlock(map, map.shaderBlock_, map.currentDesc_, map.key_, true);
    if (record) {
        record->CaptureAfter(map);
        theHold.Put(record);
    }
    if (map.shaderBlock_) map.shaderBlock_->RefreshUI();
    map.ivalid_.SetEmpty();
    map.NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
}
