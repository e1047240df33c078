// Test support: the CPU shading system as the reference for viewport code. A snippet of OSL is
// compiled into a small shader whose inputs are varying parameters, and run once per sample.
#pragma once

#include <OSL/oslcomp.h>
#include <OSL/oslexec.h>

#include <array>
#include <cstring>
#include <memory>
#include <string>

namespace viewport_test {

// Keeps every message the compiler and the shading system report, for the failure text.
class MessageLog final : public OSL::ErrorHandler {
public:
    void operator()(int, const std::string& msg) override { text += msg + "\n"; }
    std::string text;
};

// One OSL snippet, shaded on the CPU. The snippet sees the sample as floats x, y, z, w (and the
// point p = (x, y, z)), its periods as tx, ty, tz, tw (and the vector t), and sets color r.
class CpuReference {
public:
    explicit CpuReference(const std::string& statements) : m_system(nullptr, nullptr, &m_log) {
        const std::string source =
            "shader agree(float x = 0, float y = 0, float z = 0, float w = 0,\n"
            "             float tx = 1, float ty = 1, float tz = 1, float tw = 1,\n"
            "             output color r = 0)\n{\n"
            "    point p = point(x, y, z);\n"
            "    vector t = vector(tx, ty, tz);\n    " +
            statements + "\n}\n";
        OSL::OSLCompiler compiler(&m_log);
        std::string oso;
        if (!compiler.compile_buffer(source, oso, {}, "", "agree.osl")) {
            m_error = "does not compile:\n" + source + "\n" + m_log.text;
            return;
        }
        if (!m_system.LoadMemoryCompiledShader("agree", oso)) {
            m_error = "does not load:\n" + m_log.text;
            return;
        }
        m_group = m_system.ShaderGroupBegin("");
        const float zero = 0.0f;
        for (const char* name : kInputs)
            m_system.Parameter(*m_group, name, OSL::TypeDesc::TypeFloat, &zero, false);
        if (!m_system.Shader(*m_group, "surface", "agree", "layer") ||
            !m_system.ShaderGroupEnd(*m_group)) {
            m_error = "no group:\n" + m_log.text;
            return;
        }
        m_result = m_system.find_symbol(*m_group, OSL::ustring("r"));
        if (!m_result) {
            m_error = "no output r";
            return;
        }
        m_thread = m_system.create_thread_info();
        m_context = m_system.get_context(m_thread);
    }
    ~CpuReference() {
        if (m_context) m_system.release_context(m_context);
        if (m_thread) m_system.destroy_thread_info(m_thread);
    }
    CpuReference(const CpuReference&) = delete;
    CpuReference& operator=(const CpuReference&) = delete;

    // Empty when the snippet is ready to run.
    const std::string& Error() const { return m_error; }

    // r for the sample q with periods t; false (and the log in Error()) when shading failed.
    bool Run(const std::array<float, 4>& q, const std::array<float, 4>& t,
             std::array<float, 3>& r) {
        if (!m_error.empty()) return false;
        for (int i = 0; i < 4; ++i) {
            m_system.ReParameter(*m_group, "layer", kInputs[i], OSL::TypeDesc::TypeFloat, &q[i]);
            m_system.ReParameter(*m_group, "layer", kInputs[4 + i], OSL::TypeDesc::TypeFloat,
                                 &t[i]);
        }
        OSL::ShaderGlobals globals;
        std::memset(static_cast<void*>(&globals), 0, sizeof globals);
        if (!m_system.execute(*m_context, *m_group, 0, globals)) {
            m_error = "execute failed:\n" + m_log.text;
            return false;
        }
        const void* address = m_system.symbol_address(*m_context, m_result);
        if (!address) {
            m_error = "r has no value";
            return false;
        }
        std::memcpy(r.data(), address, sizeof(float) * 3);
        return true;
    }

private:
    static constexpr const char* kInputs[8] = {"x", "y", "z", "w", "tx", "ty", "tz", "tw"};

    MessageLog m_log;
    OSL::ShadingSystem m_system;
    OSL::ShaderGroupRef m_group;
    const OSL::ShaderSymbol* m_result = nullptr;
    OSL::PerThreadInfo* m_thread = nullptr;
    OSL::ShadingContext* m_context = nullptr;
    std::string m_error;
};

} // namespace viewport_test
