// `tessel describe`: what a shader becomes in the module: its inputs as host parameters (types,
// defaults, ranges, labels and companion maps), its outputs, its metadata and its cache file.
#include "command_registry.h"

#include "compile/compiled_shader_registry.h"

#include <trelm/core/mstr.h>
#include <trelm/params/param_def.h>

#include <fstream>
#include <iostream>
#include <sstream>

namespace {

// Compiler messages of the command, printed as they come.
class PrintingErrorHandler : public OIIO::ErrorHandler {
public:
    void operator()(int, const std::string& msg) override { std::cerr << msg << "\n"; }
};

std::string HostTypeName(int type) {
    std::string name;
    switch (TrelmSDK::BaseType(type)) {
    case TrelmSDK::TYPE_FLOAT:
        name = "float";
        break;
    case TrelmSDK::TYPE_INT:
        name = "integer";
        break;
    case TrelmSDK::TYPE_POINT3:
        name = "point3";
        break;
    case TrelmSDK::TYPE_BOOL:
        name = "boolean";
        break;
    case TrelmSDK::TYPE_WORLD:
        name = "worldunits";
        break;
    case TrelmSDK::TYPE_STRING:
        name = "string";
        break;
    case TrelmSDK::TYPE_FILENAME:
        name = "filename";
        break;
    case TrelmSDK::TYPE_TEXMAP:
        name = "texturemap";
        break;
    case TrelmSDK::TYPE_MATRIX3:
        name = "matrix3";
        break;
    case TrelmSDK::TYPE_POINT4:
        name = "point4";
        break;
    case TrelmSDK::TYPE_FRGBA:
        name = "frgba";
        break;
    case TrelmSDK::TYPE_POINT2:
        name = "point2";
        break;
    default:
        name = "?";
        break;
    }
    if (TrelmSDK::IsTabType(type)) name += " table";
    return name + " (" + std::to_string(type) + ")";
}

std::string ValueText(const PB2Value& v) {
    std::ostringstream out;
    std::visit(
        [&](const auto& x) {
            using T = std::decay_t<decltype(x)>;
            if constexpr (std::is_same_v<T, int> || std::is_same_v<T, float>)
                out << x;
            else if constexpr (std::is_same_v<T, TrelmSDK::Point2>)
                out << x.x << " " << x.y;
            else if constexpr (std::is_same_v<T, TrelmSDK::Point3>)
                out << x.x << " " << x.y << " " << x.z;
            else if constexpr (std::is_same_v<T, TrelmSDK::Point4>)
                out << x.x << " " << x.y << " " << x.z << " " << x.w;
            else if constexpr (std::is_same_v<T, TrelmSDK::AColor>)
                out << x.r << " " << x.g << " " << x.b << " " << x.a;
            else if constexpr (std::is_same_v<T, TrelmSDK::Matrix3>) {
                for (int r = 0; r < 4; ++r) {
                    const auto row = x.GetRow(r);
                    out << (r ? " | " : "") << row.x << " " << row.y << " " << row.z;
                }
            } else if constexpr (std::is_same_v<T, MSTR>)
                out << '"' << TrelmSDK::ToUTF8(x) << '"';
            else
                out << "none";
        },
        v.storage());
    return out.str();
}

int runDescribe(const std::string& file) {
    std::ifstream in(file, std::ios::binary);
    if (!in) {
        std::cerr << "tessel describe: cannot read " << file << "\n";
        return 1;
    }
    std::ostringstream text;
    text << in.rdbuf();
    const std::string source = text.str();

    CompiledShaderRegistry& registry = CompiledShaderRegistry::Instance();
    const SourceKey key = CompiledShaderRegistry::SourceKeyOf(source);
    PrintingErrorHandler errors;
    if (!registry.Contains(key)) registry.Compile(source, &errors, TrelmSDK::FromUTF8(file));
    auto info = registry.Description(key);
    if (!info) {
        std::cerr << "FAILED " << file << "\n";
        return 1;
    }
    std::cout << "shader " << info->shaderName << "\n";
    std::cout << "key " << key << " (" << CompiledShaderRegistry::ShaderName(key) << ")\n";
    std::cout << "cache " << CompiledShaderRegistry::CacheFile(key).string() << "\n";
    if (!info->blockDesc) return 1;

    const size_t n = info->types.size();
    std::cout << "inputs:\n";
    for (size_t i = 0; i < n; ++i) {
        const ParamDef* def = info->blockDesc->GetParamDef(static_cast<ParamID>(i));
        const ParamDef* map = info->blockDesc->GetParamDef(static_cast<ParamID>(n + i));
        if (!def && !map) continue;
        std::cout << "  " << i << " " << TrelmSDK::ToUTF8(info->names[i]) << " ("
                  << info->types[i].c_str() << ") label \"" << TrelmSDK::ToUTF8(info->labels[i])
                  << "\"";
        if (def) {
            std::cout << " host " << HostTypeName(def->type);
            if (def->IsTab()) std::cout << " count " << def->tab_size;
            std::cout << " default " << ValueText(def->def);
            if (def->has_range)
                std::cout << " range [" << def->range_low << ", " << def->range_high << "]";
        } else {
            std::cout << " no value";
        }
        if (map)
            std::cout << " companion " << TrelmSDK::ToUTF8(map->int_name) << " \""
                      << TrelmSDK::ToUTF8(info->labels[n + i]) << "\"";
        std::cout << "\n";
    }
    std::cout << "outputs:\n";
    for (size_t k = 0; k < info->outputNames.size(); ++k) {
        const int index = info->outputIndices[k];
        std::cout << "  " << index << " " << TrelmSDK::ToUTF8(info->outputNames[k]);
        if (index >= 0) std::cout << " (" << info->types[static_cast<size_t>(index)].c_str() << ")";
        std::cout << "\n";
    }
    std::cout << "metadata:\n";
    for (const auto& [param, items] : info->metadata)
        for (const auto& [name, value] : items)
            std::cout << "  " << (param.empty() ? std::string("(shader)") : param) << " " << name
                      << " = " << value << "\n";
    return 0;
}

const tessel_cli::CommandRegistrar registrar{
    "describe", "Show what a shader becomes: host parameters, outputs, metadata, cache file",
    [](CLI::App& sub) -> std::function<int()> {
        auto file = std::make_shared<std::string>();
        sub.add_option("file", *file, "An .osl source or .oso bytecode file")->required();
        return [file] { return runDescribe(*file); };
    }};

} // namespace
