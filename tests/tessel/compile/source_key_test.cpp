// SourceKey and shader names.
#include "compile/compiled_shader_registry.h"
#include "compile/source_key.h"

#include <gtest/gtest.h>

TEST(SourceKey, AbcFollowsTheMultiplyAddRecurrence) {
    EXPECT_EQ(SourceKeyOf("abc"), 417419622498ull);
    EXPECT_EQ(SourceKeyOf("abc"), (97ull * 65599 + 98) * 65599 + 99);
    EXPECT_EQ(ShaderNameOf(SourceKeyOf("abc")), "shader417419622498");
    EXPECT_EQ(CompiledShaderRegistry::ShaderName(417419622498ull), "shader417419622498");
}

TEST(SourceKey, EmptyTextIsZero) {
    EXPECT_EQ(SourceKeyOf(""), 0u);
    EXPECT_EQ(ShaderNameOf(0), "shader0");
}

TEST(SourceKey, HighBytesAddNegativeAmounts) {
    EXPECT_EQ(SourceKeyOf("\xFF"), ~0ull); // -1 wraps to 2^64 - 1
    EXPECT_EQ(SourceKeyOf("a\xFF"), 97ull * 65599 - 1);
    EXPECT_EQ(SourceKeyOf("\x80"), static_cast<std::uint64_t>(-128));
    const std::string withFF = std::string("ab") + '\xFF';
    EXPECT_EQ(SourceKeyOf(withFF), (97ull * 65599 + 98) * 65599 - 1);
}

TEST(SourceKey, ArithmeticWrapsModulo64Bits) {
    const std::string text(64, 'z');
    std::uint64_t expected = 0;
    for (char c : text) expected = expected * 65599u + static_cast<std::uint64_t>(c);
    EXPECT_EQ(SourceKeyOf(text), expected);
    EXPECT_EQ(ShaderNameOf(~0ull), "shader18446744073709551615");
}

TEST(SourceKey, DerivedKeysSignExtendTheShiftedVersion) {
    // 20200 << 16 = 0x4EE80000 fits in 31 bits: no sign extension.
    EXPECT_EQ(CompiledShaderRegistry::DerivedKey(0, 20200), 0x4EE80000ull);
    // 40000 << 16 overflows into the sign bit and extends to 64 bits.
    EXPECT_EQ(CompiledShaderRegistry::DerivedKey(0, 40000), 0xFFFFFFFF9C400000ull);
    EXPECT_EQ(CompiledShaderRegistry::DerivedKey(5, 20190), 0x4EDE0000ull ^ 5);
}
