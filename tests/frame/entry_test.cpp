#include <gtest/gtest.h>

#include <array>
#include <cstring>

#include "frame/recorded_test.hpp"

namespace sm::test {
namespace {

class Entry : public RecordedTest {
 protected:
  static std::array<std::uint64_t, 12> words(const SmExtension* extension) {
    std::array<std::uint64_t, 12> out{};
    std::memcpy(out.data(), extension, sizeof out);
    return out;
  }

  template <class Function>
  static std::uint64_t word(Function* function) {
    return reinterpret_cast<std::uintptr_t>(function);
  }
};

TEST_P(Entry, stores_the_handle_and_nothing_else) {
  const std::size_t asked = record().pools.size();
  auto other = make_host(GetParam());
  EXPECT_EQ(qxextent(other->services()), 0);
  EXPECT_EQ(Exported_QXHandle, other->services());
  EXPECT_EQ(qxextent(record().services()), 0);
  EXPECT_EQ(Exported_QXHandle, record().services());
  EXPECT_EQ(record().pools.size(), asked);
  EXPECT_EQ(other->live_pools(), 0);
}

TEST_P(Entry, the_version_hand_over_answers_5_1_and_stores_the_handle) {
  qxextent(nullptr);
  std::int32_t major = -1;
  std::int32_t minor = -1;
  EXPECT_EQ(qxextver(record().services(), &major, &minor), 0);
  EXPECT_EQ(major, 5);
  EXPECT_EQ(minor, 1);
  EXPECT_EQ(Exported_QXHandle, record().services());
}

TEST_P(Entry, the_extension_object_holds_its_twelve_words) {
  extension_ = qxesm(nullptr, nullptr);
  ASSERT_NE(extension_, nullptr);
  const auto at = words(extension_);
  for (const std::size_t zero : {0U, 1U, 2U, 5U, 7U, 8U}) EXPECT_EQ(at[zero], 0U) << "word " << zero + 1;
  EXPECT_EQ(at[3], word(&qxsmGetReqVersion));
  EXPECT_EQ(at[4], word(&qxsmGetVersion));
  EXPECT_EQ(at[6], word(&qxsmDestroyExtension));
  EXPECT_EQ(at[9], word(extension_->pool));
  EXPECT_NE(at[9], 0U);
  EXPECT_EQ(at[10], word(extension_->tree_extension));
  EXPECT_NE(at[10], 0U);
  EXPECT_EQ(at[11], word(&CreateInstance));
}

TEST_P(Entry, asks_for_one_pool_one_block_and_the_tree_extension) {
  int owner = 0;
  int unused = 0;
  extension_ = qxesm(&unused, &owner);
  ASSERT_NE(extension_, nullptr);
  ASSERT_EQ(record().pools.size(), 1U);
  EXPECT_EQ(record().pools[0].parms.flag, SM_POOL_EXTENSION);
  EXPECT_EQ(record().pools[0].parms.reserved[0], 0U);
  EXPECT_EQ(record().pools[0].parms.reserved[1], 0U);
  EXPECT_EQ(record().pools[0].owner, &owner);
  EXPECT_FALSE(record().pools[0].named);
  ASSERT_EQ(record().blocks.size(), 1U);
  EXPECT_EQ(record().blocks[0].bytes, 96U);
  EXPECT_EQ(record().blocks[0].flags, SM_POOL_ZERO);
  ASSERT_EQ(record().extensions.size(), 1U);
  EXPECT_EQ(record().extensions[0].name, L"qxeavl");
  EXPECT_EQ(record().extensions[0].length, 6);
  EXPECT_EQ(record().extensions[0].zero, nullptr);
}

TEST_P(Entry, answers_the_required_and_its_own_version) {
  extension_ = qxesm(nullptr, nullptr);
  ASSERT_NE(extension_, nullptr);
  std::int32_t v[3] = {-1, -1, -1};
  EXPECT_EQ(extension_->qxsmGetReqVersion(extension_, &v[0], &v[1], &v[2]), 0);
  EXPECT_EQ(v[0], 5);
  EXPECT_EQ(v[1], 1);
  EXPECT_EQ(v[2], 1);
  EXPECT_EQ(extension_->qxsmGetVersion(extension_, &v[0], &v[1], &v[2]), 0);
  EXPECT_EQ(v[0], 1);
  EXPECT_EQ(v[1], 0);
  EXPECT_EQ(v[2], 0);
}

TEST_P(Entry, the_version_record_fills_exactly_208_bytes) {
  std::array<char, 240> first{};
  std::array<char, 240> second{};
  first.fill('\x5A');
  second.fill('\x33');
  qxvercn1(first.data() + 16);
  qxvercn1(second.data() + 16);
  EXPECT_EQ(std::memcmp(first.data() + 16, second.data() + 16, 208), 0);
  for (std::size_t i = 0; i < first.size(); ++i) {
    if (i >= 16 && i < 16 + 208) continue;
    EXPECT_EQ(first[i], '\x5A') << i;
    EXPECT_EQ(second[i], '\x33') << i;
  }
}

TEST_P(Entry, a_refused_request_makes_the_entry_answer_null_and_leaves_nothing) {
  for (const bool for_ever : {false, true}) {
    for (std::int64_t k = 0;; ++k) {
      host_->fail_request(k, for_ever);
      SmExtension* extension = qxesm(nullptr, nullptr);
      if (host_->stop_failing() == 0) {
        EXPECT_GE(k, 3) << "a pool, a block and an extension are asked for";
        ASSERT_NE(extension, nullptr);
        EXPECT_EQ(qxsmDestroyExtension(extension), 0);
        break;
      }
      EXPECT_EQ(extension, nullptr) << "request " << k;
      EXPECT_EQ(record().live_pools(), 0) << "request " << k;
      EXPECT_EQ(record().live_extensions(), 0) << "request " << k;
      EXPECT_EQ(host_->live_pools(), 0) << "request " << k;
      EXPECT_EQ(host_->live_blocks(), 0) << "request " << k;
    }
  }
}

TEST_P(Entry, a_failed_tree_extension_load_leaves_no_pool_behind) {
  host_->fail_request(2, false);
  EXPECT_EQ(qxesm(nullptr, nullptr), nullptr);
  EXPECT_EQ(host_->stop_failing(), 1);
  EXPECT_EQ(record().extensions.size(), 1U);
  EXPECT_EQ(record().pools.size(), 1U);
  EXPECT_EQ(record().live_pools(), 0);
}

TEST_P(Entry, destroying_gives_the_tree_extension_back_once) {
  extension_ = qxesm(nullptr, nullptr);
  ASSERT_NE(extension_, nullptr);
  EXPECT_EQ(extension_->qxsmDestroyExtension(extension_), 0);
  extension_ = nullptr;
  EXPECT_EQ(record().events, std::vector<std::string>{"extension destroyed"});
  EXPECT_EQ(record().live_pools(), 0);
}

TEST_P(Entry, destroying_an_extension_without_a_tree_handle_is_harmless) {
  extension_ = qxesm(nullptr, nullptr);
  ASSERT_NE(extension_, nullptr);
  extension_->tree_extension->destroy(extension_->tree_extension);
  extension_->tree_extension = nullptr;
  EXPECT_EQ(qxsmDestroyExtension(extension_), 0);
  extension_ = nullptr;
  EXPECT_EQ(record().events.size(), 1U);
}

TEST_P(Entry, destroying_no_extension_is_harmless) { EXPECT_EQ(qxsmDestroyExtension(nullptr), 0); }

TEST_P(Entry, two_extensions_stand_beside_each_other) {
  extension_ = qxesm(nullptr, nullptr);
  SmExtension* other = qxesm(nullptr, nullptr);
  ASSERT_NE(extension_, nullptr);
  ASSERT_NE(other, nullptr);
  EXPECT_NE(extension_->pool, other->pool);
  EXPECT_EQ(qxsmDestroyExtension(other), 0);
  instance_ = CreateInstance(extension_);
  EXPECT_NE(instance_, nullptr);
}

INSTANTIATE_BOTH_HOSTS(Entry);

}  // namespace
}  // namespace sm::test
