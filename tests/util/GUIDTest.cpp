#include <gtest/gtest.h>

#include <set>
#include <string>
#include <thread>
#include <type_traits>
#include <vector>

#include <zarl/util/GUID.h>

namespace {

using zarl::util::GUID;

static_assert(std::is_nothrow_copy_constructible_v<GUID>);

// 8-4-4-4-12 lowercase hex digits that spell the bytes in order.
TEST(GUID, TextForm) {
    static constexpr char kHex[] = "0123456789abcdef";
    for (int i = 0; i < 1000; ++i) {
        const GUID guid = GUID::FromRandom();
        std::string expected;
        for (std::size_t k = 0; k < 16; ++k) {
            expected += (k == 4 || k == 6 || k == 8 || k == 10) ? "-" : "";
            expected += kHex[guid.GetBytes()[k] >> 4];
            expected += kHex[guid.GetBytes()[k] & 0x0F];
        }
        const std::string text = guid.ToString();
        ASSERT_EQ(text, expected);
        ASSERT_EQ(text[14], '4') << text;                                          // version
        ASSERT_NE(std::string("89ab").find(text[19]), std::string::npos) << text;  // variant
    }
}

// Over many draws each of the 122 random bits takes both values, and the six fixed bits
// never change (catches stuck, zeroed or reused bytes).
TEST(GUID, RandomBitsVaryFixedBitsDoNot) {
    GUID::Bytes anyOne{};
    GUID::Bytes allOne;
    allOne.fill(0xFF);
    for (int i = 0; i < 2000; ++i) {
        const GUID::Bytes bytes = GUID::FromRandom().GetBytes();
        for (std::size_t k = 0; k < bytes.size(); ++k) {
            anyOne[k] |= bytes[k];
            allOne[k] &= bytes[k];
        }
    }
    for (std::size_t k = 0; k < anyOne.size(); ++k) {
        const int fixedMask = k == 6 ? 0xF0 : k == 8 ? 0xC0 : 0x00;
        const int fixedValue = k == 6 ? 0x40 : k == 8 ? 0x80 : 0x00;
        EXPECT_EQ(anyOne[k], fixedValue | (0xFF & ~fixedMask)) << "byte " << k;
        EXPECT_EQ(allOne[k], fixedValue) << "byte " << k;
    }
}

TEST(GUID, HundredThousandDrawsAreDistinct) {
    std::set<GUID::Bytes> seen;
    for (int i = 0; i < 100000; ++i) {
        ASSERT_TRUE(seen.insert(GUID::FromRandom().GetBytes()).second) << "repeat at draw " << i;
    }
}

// Each thread keeps its own pool of random bytes; no two threads may hand out the same
// bytes.
TEST(GUID, DrawsOnSeveralThreadsAreDistinct) {
    constexpr int kThreads = 4;
    constexpr int kDraws = 10000;
    std::vector<std::vector<GUID::Bytes>> drawn(kThreads);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([&list = drawn[t]] {
            for (int i = 0; i < kDraws; ++i) {
                list.push_back(GUID::FromRandom().GetBytes());
            }
        });
    }
    std::set<GUID::Bytes> seen;
    for (int t = 0; t < kThreads; ++t) {
        threads[t].join();
        seen.insert(drawn[t].begin(), drawn[t].end());
    }
    EXPECT_EQ(seen.size(), std::size_t{kThreads * kDraws});
}

TEST(GUID, EqualityFollowsTheBytes) {
    const GUID a = GUID::FromRandom();
    const GUID b = GUID::FromRandom();
    GUID copy = a;
    EXPECT_TRUE(copy == a && !(copy != a) && copy.ToString() == a.ToString());
    EXPECT_TRUE(a != b && !(a == b));
    copy = b;
    EXPECT_TRUE(copy == b && copy != a);
}

}  // namespace
