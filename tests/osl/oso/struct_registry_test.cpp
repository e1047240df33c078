// The process-wide struct registry: lookups by name and id, text forms of struct types, and
// readers registering the same structs from several threads at once.
#include <OSL/osoreader.h>
#include <OSL/typespec.h>

#include <gtest/gtest.h>

#include <atomic>
#include <barrier>
#include <thread>

using namespace OSL;

namespace {

TEST(StructRegistry, RegistersByNameAndFindsTheNewestDefinition) {
    const int first = TypeSpec::structure_id("registry_test_S", true);
    ASSERT_GT(first, 0);
    EXPECT_EQ(TypeSpec::structure_id("registry_test_S"), first);
    EXPECT_EQ(TypeSpec::structure_id("registry_test_absent"), 0);

    auto* spec = new StructSpec(ustring("registry_test_S"), 2);
    spec->add_field(TypeDesc::TypeFloat, ustring("x"));
    const int second = TypeSpec::new_struct(spec);
    EXPECT_GT(second, first);
    EXPECT_EQ(TypeSpec::structure_id("registry_test_S"), second);
    EXPECT_EQ(TypeSpec::structspec(second), spec);
    EXPECT_EQ(spec->mangled(), "___2_registry_test_S");
    EXPECT_EQ(TypeSpec::structspec(0), nullptr);
    EXPECT_EQ(TypeSpec::structspec(-3), nullptr);
    EXPECT_EQ(TypeSpec::structspec(0x7fff), nullptr);
    EXPECT_EQ(TypeSpec::new_struct(nullptr), 0);

    const auto list = TypeSpec::struct_list();
    ASSERT_GT((int)list.size(), second);
    EXPECT_EQ(list[0], nullptr);
    EXPECT_EQ(list[second].get(), spec);
}

TEST(StructRegistry, StructTypesPrintTheirNameAndArrayLength) {
    const TypeSpec s("registry_test_T", 0);
    EXPECT_TRUE(s.is_structure());
    EXPECT_EQ(s.string(), "struct registry_test_T");
    EXPECT_STREQ(s.c_str(), "struct registry_test_T");
    const TypeSpec a("registry_test_T", 0, 3);
    EXPECT_TRUE(a.is_structure_array());
    EXPECT_EQ(a.structure(), s.structure());
    EXPECT_EQ(a.string(), "struct registry_test_T[3]");
    EXPECT_EQ(a.elementtype(), s);
    EXPECT_EQ(TypeSpec(TypeDesc::TypeFloat).string(), "float");
    EXPECT_EQ(TypeSpec(TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC3, TypeDesc::COLOR, 3)).string(),
              "color[3]");
    EXPECT_EQ(TypeSpec(TypeDesc(TypeDesc::NONE)).string(), "void");
    TypeSpec unsized(TypeDesc::TypeInt);
    unsized.make_array(-1);
    EXPECT_EQ(unsized.string(), "int[]");
    EXPECT_EQ(unsized.numelements(), 1);
}

TEST(StructRegistry, EquivalenceAndAssignability) {
    const TypeSpec p(TypeDesc::TypePoint), v(TypeDesc::TypeVector), c(TypeDesc::TypeColor);
    const TypeSpec f(TypeDesc::TypeFloat), i(TypeDesc::TypeInt);
    EXPECT_TRUE(equivalent(p, v));
    EXPECT_FALSE(equivalent(p, c));
    EXPECT_TRUE(assignable(c, f));
    EXPECT_TRUE(assignable(f, i));
    EXPECT_FALSE(assignable(i, f));
    const TypeSpec closure(TypeDesc::TypeColor, true);
    EXPECT_FALSE(assignable(closure, c));
    EXPECT_TRUE(assignable(closure, closure));
}

TEST(StructRegistry, ConcurrentReadersAgreeOnStructIds) {
    // Each round reads a shader of its own name, so each round races to register a new struct.
    auto oso = [](int round) {
        return "OpenShadingLanguage 1.00\nshader conc" + std::to_string(round) +
               "\n"
               "param\tstruct P\tp\t\t%structfields{a,b} %structfieldtypes{\"fc\"}\n"
               "param\tfloat\tp.a\t1\nparam\tcolor\tp.b\t0 0 0\n"
               "code ___main___\n\tend\n";
    };
    struct StructReader : OSOReader {
        void symbol(SymType, TypeSpec t, const char*) override {
            if (t.is_structure()) id = t.structure();
        }
        int id = 0;
    };
    constexpr int kThreads = 4, kRounds = 200;
    std::vector<std::vector<int>> ids(kThreads);
    std::atomic<bool> bad_lookup{false};
    std::barrier round_start(kThreads);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back([&, t] {
            for (int r = 0; r < kRounds; ++r) {
                round_start.arrive_and_wait();
                StructReader reader;
                if (!reader.parse_memory(oso(r))) bad_lookup = true;
                const StructSpec* spec = TypeSpec::structspec(reader.id);
                if (!spec || spec->numfields() != 2 || spec->field(1).name != "b")
                    bad_lookup = true;
                ids[t].push_back(reader.id);
                // Unrelated registrations race with the lookups above.
                TypeSpec::structure_id(
                    ("conc_" + std::to_string(t) + "_" + std::to_string(r % 5)).c_str(), true);
            }
        });
    for (auto& th : threads) th.join();
    EXPECT_FALSE(bad_lookup);
    for (int r = 0; r < kRounds; ++r)
        for (int t = 1; t < kThreads; ++t) EXPECT_EQ(ids[t][r], ids[0][r]) << "round " << r;
}

} // namespace
