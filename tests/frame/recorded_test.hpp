// Fixture: the module on a host that records what it asks for.
#pragma once

#include <gtest/gtest.h>

#include <memory>

#include "frame/recording_host.hpp"
#include "support/module_test.hpp"

namespace sm::test {

class RecordedTest : public ::testing::TestWithParam<HostKind> {
 protected:
  void SetUp() override {
    host_ = make_host(GetParam());
    record_ = std::make_unique<RecordingHost>(host_->services());
    std::int32_t major = 0;
    std::int32_t minor = 0;
    ASSERT_EQ(qxextver(record_->services(), &major, &minor), 0);
  }

  void TearDown() override {
    if (instance_) {
      EXPECT_EQ(qxsmDestroyInstance(&instance_), SM_OK);
    }
    if (extension_) {
      EXPECT_EQ(qxsmDestroyExtension(extension_), 0);
    }
    EXPECT_EQ(record_->live_pools(), 0);
    EXPECT_EQ(record_->live_trees(), 0);
    EXPECT_EQ(record_->live_extensions(), 0);
    EXPECT_EQ(record_->offences(), 0);
    for (const BlockRequest& block : record_->blocks) {
      EXPECT_TRUE(block.flags == 0 || block.flags == SM_POOL_ZERO) << block.flags;
    }
    EXPECT_EQ(host_->live_pools(), 0);
    EXPECT_EQ(host_->live_blocks(), 0);
    EXPECT_EQ(host_->violations(), 0);
  }

  void start() {
    extension_ = qxesm(nullptr, nullptr);
    ASSERT_NE(extension_, nullptr);
    instance_ = CreateInstance(extension_);
    ASSERT_NE(instance_, nullptr);
  }

  RecordingHost& record() { return *record_; }

  std::unique_ptr<TestHost> host_;
  std::unique_ptr<RecordingHost> record_;
  SmExtension* extension_ = nullptr;
  SmInstance* instance_ = nullptr;
};

}  // namespace sm::test
