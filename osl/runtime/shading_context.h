// Per-thread execution state: the heap a group's program runs in, which layers have run, the
// closure arena, messages and buffered shader output. One context executes one sample at a time;
// contexts are never shared between threads while in use.
#pragma once

#include "program.h"

#include <OSL/dual.h>
#include <OSL/oslexec.h>

#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace OSL {

struct PerThreadInfo {
    std::vector<std::unique_ptr<ShadingContext>> freeContexts;
};

// Closures live in fixed-size chunks so that pointers stay valid while a sample grows the arena;
// chunks are kept between samples, so steady-state shading allocates nothing.
class ClosureArena {
public:
    void* allocate(size_t size, size_t align);
    void reset() { m_chunk = 0, m_used = 0; }

private:
    static constexpr size_t kChunk = 64 * 1024;
    std::vector<std::unique_ptr<char[]>> m_chunks;
    std::vector<std::unique_ptr<char[]>> m_large;
    size_t m_chunk = 0, m_used = 0;
};

struct MessageRecord {
    ustring name;
    TypeDesc type;
    int layer = -1;
    bool derivs = false;
    std::vector<char> data; // capacity kept between samples
    bool live = false;
    bool queriedOnly = false; // made by a getmessage that found nothing
    ustring file;             // where it was set (or first queried)
    int line = 0;
};

enum ExecStatus : uint8_t { Running = 0, Returned = 1, Broke = 2, Continued = 4, Exited = 8 };

class ShadingContext {
public:
    ShadingContext(ShadingSystemImpl& sys, PerThreadInfo* thread) : system(&sys), thread(thread) {}

    ShadingSystemImpl* system;
    PerThreadInfo* thread;
    std::vector<char> heapStorage;
    char* heap = nullptr;
    uint64_t boundSerial = 0;
    std::vector<uint8_t> layerRan;
    std::vector<uint8_t> paramResolved;
    ClosureArena closures;
    std::vector<MessageRecord> messages;
    std::string output;  // printf text of the current execute, flushed at its end
    std::string scratch; // format buffer
    ShaderGlobals* sg = nullptr;
    const Program* prog = nullptr; // of the group being executed, set by execute_init
    uint8_t status = Running;
    int currentLayer = -1;
    std::vector<std::string> errorsSeen;

    // Prepares the heap for the program (constants and defaults), once per program change.
    void bind(const Program& prog);
};

// Everything a kernel needs while the program runs.
struct ExecState {
    char* heap;
    ShadingContext* ctx;
    ShaderGlobals* sg;
    const Program* prog;

    float* f(const Operand& o) const { return reinterpret_cast<float*>(heap + o.offset); }
    int* i(const Operand& o) const { return reinterpret_cast<int*>(heap + o.offset); }
    ustring* s(const Operand& o) const { return reinterpret_cast<ustring*>(heap + o.offset); }
    const ClosureColor** c(const Operand& o) const {
        return reinterpret_cast<const ClosureColor**>(heap + o.offset);
    }
    void* p(const Operand& o) const { return heap + o.offset; }

    // Component c (of an element of a float-based or int operand) as a float, broadcasting
    // single values; d selects value (0), d/dx (1) or d/dy (2).
    float comp(const Operand& o, int c, int d = 0) const {
        if (o.isInt) return d ? 0.0f : float(*i(o));
        if (d && !o.derivs) return 0.0f;
        const float* base = f(o);
        const int idx = o.ncomp == 1 ? 0 : c;
        return d ? base[idx + d * (o.size / 4)] : base[idx];
    }
    Dual2<float> dual(const Operand& o, int c) const {
        if (o.isInt) return Dual2<float>(float(*i(o)));
        const float* base = f(o);
        const int idx = o.ncomp == 1 ? 0 : c;
        if (!o.derivs) return Dual2<float>(base[idx]);
        const int stride = o.size / 4;
        return Dual2<float>(base[idx], base[idx + stride], base[idx + 2 * stride]);
    }
    void store(const Operand& o, int c, const Dual2<float>& v) const {
        float* base = f(o);
        base[c] = v.val();
        if (o.derivs) {
            const int stride = o.size / 4;
            base[c + stride] = v.dx();
            base[c + 2 * stride] = v.dy();
        }
    }
    Vec3 vec(const Operand& o) const { return Vec3(comp(o, 0), comp(o, 1), comp(o, 2)); }
    Dual2<Vec3> dvec(const Operand& o) const {
        Dual2<Vec3> r;
        for (int d = 0; d < 3; ++d) r.elem(d) = Vec3(comp(o, 0, d), comp(o, 1, d), comp(o, 2, d));
        return r;
    }
    void storeVec(const Operand& o, const Dual2<Vec3>& v) const {
        float* base = f(o);
        for (int k = 0; k < 3; ++k) base[k] = v.val()[k];
        if (o.derivs)
            for (int k = 0; k < 3; ++k) base[3 + k] = v.dx()[k], base[6 + k] = v.dy()[k];
    }
    void storeVec(const Operand& o, const Vec3& v) const {
        float* base = f(o);
        base[0] = v.x, base[1] = v.y, base[2] = v.z;
        if (o.derivs) std::memset(base + 3, 0, 6 * sizeof(float));
    }
    void zeroDerivs(const Operand& o) const {
        if (o.derivs) std::memset(heap + o.offset + o.size, 0, 2 * o.size);
    }
    float scalar(const Operand& o) const { return comp(o, 0); }
    int integer(const Operand& o) const { return o.isInt ? *i(o) : int(*f(o)); }
};

// Runs ops [begin, end) of the program; stops early when the status is no longer Running.
void runRange(ExecState& st, int begin, int end);
// Runs a layer unless it ran already in this execution.
void runLayer(ExecState& st, int layer);
// Resolves the connected parameters an op reads (running upstream layers first).
void resolveUses(ExecState& st, const Instr& in);

// Reports a runtime error of the shader at op `in` (through the system's error handler).
void shaderError(ExecState& st, const Instr& in, const std::string& msg);
// Reports a message of the running sample: shader output buffered so far is flushed first, and
// with error_repeats off a context reports each distinct message once.
void reportContextError(ShadingContext& ctx, const std::string& msg, bool isError = true);

} // namespace OSL
