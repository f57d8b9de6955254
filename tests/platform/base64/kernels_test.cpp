// SPDX-License-Identifier: Apache-2.0
// The base64 kernels against a plain loop over bits: all kernels that this machine can run, in
// memory that ends where the next page cannot be touched.
#include "platform/base64/kernels.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <string_view>

#include "tests/platform/base64/plain_encoder.h"
#include "tests/support/guarded_memory.h"

namespace platform::base64 {
namespace {

class Base64KernelsTest : public testing::TestWithParam<const Kernels*> {
protected:
    std::string randomGroups(std::size_t groups) {
        std::string bytes(groups * bytesPerGroup, '\0');
        for (char& byte : bytes) {
            byte = static_cast<char>(random());
        }
        return bytes;
    }

    const Kernels& kernels = *GetParam();
    test::GuardedMemory source;
    test::GuardedMemory target;
    std::mt19937 random{1};
};

TEST_P(Base64KernelsTest, EncodesEveryNumberOfGroupsAtEveryAlignment) {
    for (std::size_t groups = 0; groups < 150; ++groups) {
        for (std::size_t gap = 0; gap < 34; ++gap) {
            const std::string bytes = randomGroups(groups);
            char* const text = target.end - groups * charactersPerGroup;
            kernels.encode(source.place(bytes, gap).data(), groups, text);
            ASSERT_EQ(std::string_view(text, target.end), plainlyEncoded(bytes)) << groups;
        }
    }
}

TEST_P(Base64KernelsTest, DecodesEveryNumberOfGroupsAtEveryAlignment) {
    for (std::size_t groups = 0; groups < 150; ++groups) {
        for (std::size_t gap = 0; gap < 34; ++gap) {
            const std::string bytes = randomGroups(groups);
            char* const decoded = target.end - bytes.size();
            ASSERT_EQ(
                kernels.decode(source.place(plainlyEncoded(bytes), gap).data(), groups, decoded),
                groups);
            ASSERT_EQ(std::string_view(decoded, target.end), bytes) << groups;
        }
    }
}

TEST_P(Base64KernelsTest, StopsBeforeTheGroupOfAnyCharacterOutsideTheAlphabet) {
    constexpr std::size_t groups = 40;
    for (int c = 0; c < 256; ++c) {
        const std::string bytes = randomGroups(groups);
        const std::string text = plainlyEncoded(bytes);
        const bool isInside = alphabet.find(static_cast<char>(c)) != std::string_view::npos;
        for (std::size_t place = 0; place < text.size(); ++place) {
            std::string changed = text;
            changed[place] = static_cast<char>(c);
            char* const decoded = target.end - bytes.size();
            const std::size_t done =
                kernels.decode(source.place(changed, 0).data(), groups, decoded);
            ASSERT_EQ(done, isInside ? groups : place / charactersPerGroup) << c << " at " << place;
            const std::string_view kept(decoded, done * bytesPerGroup);
            ASSERT_EQ(plainlyEncoded(kept), changed.substr(0, done * charactersPerGroup));
        }
    }
}

TEST_P(Base64KernelsTest, StopsBeforeAGroupOfNothingButACharacterOutsideTheAlphabet) {
    constexpr std::size_t groups = 40;
    const std::string text = plainlyEncoded(randomGroups(groups));
    for (int c = 0; c < 256; ++c) {
        if (alphabet.find(static_cast<char>(c)) != std::string_view::npos) {
            continue;
        }
        for (std::size_t group = 0; group < groups; ++group) {
            std::string changed = text;
            changed.replace(group * charactersPerGroup, charactersPerGroup, charactersPerGroup,
                            static_cast<char>(c));
            char* const decoded = target.end - groups * bytesPerGroup;
            ASSERT_EQ(kernels.decode(source.place(changed, 0).data(), groups, decoded), group) << c;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Base64, Base64KernelsTest,
                         testing::ValuesIn(runnableKernels().begin(), runnableKernels().end()),
                         [](const auto& kernels) { return std::string(kernels.param->name); });

}  // namespace
}  // namespace platform::base64
