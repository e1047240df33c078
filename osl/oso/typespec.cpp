// TypeSpec's text forms and the process-wide struct registry that struct-typed TypeSpecs refer to
// by id.
#include <OSL/typespec.h>

#include "struct_registry.h"

#include <OpenImageIO/strutil.h>

#include <array>
#include <atomic>
#include <mutex>

namespace OSL {

namespace {

// Struct ids are 16-bit; id 0 means "not a struct".
constexpr int kMaxStructs = 0x7fff;
constexpr int kChunkSize = 256;
constexpr int kChunkCount = (kMaxStructs + kChunkSize) / kChunkSize;

// The registry. Readers (structspec(id), on any thread, including shading threads) never lock:
// they load atomics from chunks that, once published, never move or change. Writers (compilers
// and OSO readers on any thread) serialise on `mutex`, fill a slot, then publish the new count.
// Entries are never removed, so a pointer handed out stays valid for the life of the process.
struct StructRegistry {
    std::mutex mutex;
    std::vector<std::shared_ptr<StructSpec>> owned{nullptr}; // guarded by mutex; [0] empty
    std::array<std::atomic<std::atomic<StructSpec*>*>, kChunkCount> chunks{};
    std::atomic<int> count{1};

    StructSpec* get(int id) const {
        if (id <= 0 || id >= count.load(std::memory_order_acquire)) return nullptr;
        std::atomic<StructSpec*>* chunk = chunks[id / kChunkSize].load(std::memory_order_acquire);
        return chunk ? chunk[id % kChunkSize].load(std::memory_order_acquire) : nullptr;
    }

    // Caller holds mutex.
    int add(std::shared_ptr<StructSpec> spec) {
        const int id = count.load(std::memory_order_relaxed);
        if (id > kMaxStructs) return 0;
        auto& chunk = chunks[id / kChunkSize];
        if (!chunk.load(std::memory_order_relaxed))
            chunk.store(
                new std::atomic<StructSpec*>[kChunkSize] {}, std::memory_order_release);
        chunk.load(std::memory_order_relaxed)[id % kChunkSize].store(spec.get(),
                                                                     std::memory_order_release);
        owned.push_back(std::move(spec));
        count.store(id + 1, std::memory_order_release);
        return id;
    }

    // Caller holds mutex. Newest first, so a redefinition shadows older ones of the same name.
    int find(ustring name) const {
        for (int i = (int)owned.size() - 1; i > 0; --i)
            if (owned[i]->name() == name) return i;
        return 0;
    }
};

StructRegistry& registry() {
    // Never destroyed: TypeSpecs may be used from static destructors of other files.
    static StructRegistry* r = new StructRegistry;
    return *r;
}

} // namespace

TypeSpec::TypeSpec(const char* name, int structid, int arraylen)
    : m_simple(TypeDesc::UNKNOWN, arraylen), m_structure((short)structid), m_closure(false) {
    if (m_structure == 0 && name) m_structure = (short)structure_id(name, true);
}

std::string TypeSpec::string() const {
    std::string str;
    if (m_closure) {
        str = "closure color";
    } else if (m_structure > 0) {
        const StructSpec* spec = structspec();
        str = "struct ";
        str += spec ? spec->name().string() : std::to_string(m_structure);
    } else if (m_simple.basetype == TypeDesc::NONE) {
        str = "void";
    } else {
        str = m_simple.elementtype().c_str();
    }
    if (is_unsized_array())
        str += "[]";
    else if (is_sized_array())
        str += "[" + std::to_string(m_simple.arraylen) + "]";
    return str;
}

const char* TypeSpec::c_str() const {
    return ustring(string()).c_str();
}

StructSpec* TypeSpec::structspec(int id) {
    return registry().get(id);
}

int TypeSpec::structure_id(const char* name, bool add) {
    if (!name) return 0;
    StructRegistry& r = registry();
    const ustring n(name);
    std::lock_guard<std::mutex> lock(r.mutex);
    if (int id = r.find(n)) return id;
    return add ? r.add(std::make_shared<StructSpec>(n, 0)) : 0;
}

int TypeSpec::new_struct(StructSpec* n) {
    if (!n) return 0;
    std::shared_ptr<StructSpec> owned(n);
    StructRegistry& r = registry();
    std::lock_guard<std::mutex> lock(r.mutex);
    return r.add(std::move(owned));
}

std::vector<std::shared_ptr<StructSpec>> TypeSpec::struct_list() {
    StructRegistry& r = registry();
    std::lock_guard<std::mutex> lock(r.mutex);
    return r.owned;
}

static bool same_fields(const StructSpec& a, const StructSpec& b) {
    if (a.numfields() != b.numfields()) return false;
    for (int i = 0; i < a.numfields(); ++i)
        if (a.field(i).name != b.field(i).name || a.field(i).type != b.field(i).type) return false;
    return true;
}

int find_or_register_struct(std::unique_ptr<StructSpec> spec) {
    if (!spec) return 0;
    StructRegistry& r = registry();
    std::lock_guard<std::mutex> lock(r.mutex);
    for (int i = (int)r.owned.size() - 1; i > 0; --i)
        if (r.owned[i]->name() == spec->name() && same_fields(*r.owned[i], *spec)) return i;
    return r.add(std::shared_ptr<StructSpec>(spec.release()));
}

static bool equivalent(const StructSpec* a, const StructSpec* b) {
    if (a == b) return true;
    if (!a || !b || a->numfields() != b->numfields()) return false;
    for (int i = 0; i < a->numfields(); ++i)
        if (!equivalent(a->field(i).type, b->field(i).type)) return false;
    return true;
}

bool equivalent(const TypeSpec& a, const TypeSpec& b) {
    if (a == b) return true;
    if (a.is_structure_based() || b.is_structure_based())
        return a.is_structure_based() && b.is_structure_based() &&
               a.simpletype().arraylen == b.simpletype().arraylen &&
               equivalent(a.structspec(), b.structspec());
    return a.is_vectriple_based() && b.is_vectriple_based() &&
           a.is_closure_based() == b.is_closure_based() &&
           a.simpletype().arraylen == b.simpletype().arraylen;
}

std::string StructSpec::mangled() const {
    return m_scope ? OIIO::Strutil::fmt::format("___{}_{}", m_scope, m_name) : m_name.string();
}

int StructSpec::lookup_field(ustring name) const {
    for (int i = 0; i < numfields(); ++i)
        if (m_fields[i].name == name) return i;
    return -1;
}

} // namespace OSL
