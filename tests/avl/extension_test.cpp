// The entry points, the objects behind them, and what is left when the host has no memory.
#include <qxesm/qxesm.h>

#include "avl/support.hpp"

namespace sm::test {
namespace {

class ExtensionTest : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(library.qxextver && library.qxextent && library.qxeavl);
    ASSERT_EQ(0, library.qxextent(host.services()));
  }
  void TearDown() override {
    EXPECT_EQ(0, host.live_pools);
    EXPECT_EQ(0, host.live_blocks);
    EXPECT_EQ(0, host.foreign_frees);
  }
  TreeExtension* create(void* owner = nullptr) { return static_cast<TreeExtension*>(library.qxeavl(nullptr, owner)); }
  Library library;
  TinyHost host;
};

TEST_F(ExtensionTest, the_version_call_stores_5_and_1_and_hands_over_the_services) {
  ASSERT_EQ(0, library.qxextent(nullptr));
  EXPECT_EQ(nullptr, create());
  std::int32_t major = -1;
  std::int32_t minor = -1;
  EXPECT_EQ(0, library.qxextver(host.services(), &major, &minor));
  EXPECT_EQ(5, major);
  EXPECT_EQ(1, minor);
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  extension->destroy(extension);
}

TEST_F(ExtensionTest, its_service_handle_is_not_that_of_the_module) {
  std::int32_t major = 0;
  std::int32_t minor = 0;
  HostServices* const before = Exported_QXHandle;
  ASSERT_EQ(0, library.qxextver(host.services(), &major, &minor));
  EXPECT_EQ(before, Exported_QXHandle);
  TinyHost other;
  ASSERT_EQ(0, qxextver(other.services(), &major, &minor));
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  EXPECT_EQ(1, host.live_pools);
  EXPECT_EQ(0, other.live_pools);
  extension->destroy(extension);
  qxextent(before);
}

TEST_F(ExtensionTest, the_extension_lives_in_one_unnamed_pool_of_the_owner) {
  int owner = 0;
  TreeExtension* extension = create(&owner);
  ASSERT_NE(nullptr, extension);
  EXPECT_EQ(&owner, host.pool_owner);
  EXPECT_EQ(SM_POOL_EXTENSION, host.pool_flag);
  EXPECT_EQ("(null)", host.pool_name);
  EXPECT_EQ(1, host.live_pools);
  extension->destroy(extension);
}

TEST_F(ExtensionTest, a_manager_has_no_inner_object_and_goes_back_when_it_is_destroyed) {
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  const std::int64_t blocks = host.live_blocks;
  for (int i = 0; i < 3; ++i) {
    NonzeroTree* manager = extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree");
    ASSERT_NE(nullptr, manager);
    EXPECT_EQ(nullptr, manager->inner);
    EXPECT_EQ(nullptr, manager->cleared_word);
    EXPECT_EQ(1, host.live_pools);
    EXPECT_EQ(blocks + 1, host.live_blocks);
    manager->destroy(manager);
    EXPECT_EQ(blocks, host.live_blocks);
  }
  extension->destroy(extension);
}

TEST_F(ExtensionTest, destroying_the_extension_takes_forgotten_managers_with_it) {
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  for (int i = 0; i < 5; ++i) {
    ASSERT_NE(nullptr, extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree"));
  }
  extension->destroy(extension);
  EXPECT_EQ(0, host.live_blocks);
}

TEST_F(ExtensionTest, destroying_null_is_harmless) {
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  NonzeroTree* manager = extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree");
  ASSERT_NE(nullptr, manager);
  manager->destroy(nullptr);
  manager->destroy(manager);
  extension->destroy(nullptr);
  EXPECT_EQ(1, host.live_pools);
  extension->destroy(extension);
}

TEST_F(ExtensionTest, nodes_with_their_key_elsewhere_are_refused) {
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  const std::int64_t blocks = host.live_blocks;
  const TreeParms elsewhere = {1, 24, 10, 1};
  EXPECT_EQ(nullptr, extension->create_tree_manager(extension, &elsewhere, nullptr, "Nonzero Tree"));
  EXPECT_EQ(nullptr, extension->create_tree_manager(extension, nullptr, nullptr, "Nonzero Tree"));
  EXPECT_EQ(blocks, host.live_blocks);
  extension->destroy(extension);
}

TEST_F(ExtensionTest, without_a_pool_or_a_block_there_is_no_extension_and_nothing_is_left) {
  for (std::int64_t k = 0; k < 2; ++k) {
    host.fail_request(k);
    EXPECT_EQ(nullptr, create()) << "request " << k;
    EXPECT_EQ(0, host.live_pools);
    EXPECT_EQ(0, host.live_blocks);
  }
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  extension->destroy(extension);
}

TEST_F(ExtensionTest, without_a_block_there_is_no_manager_and_the_extension_goes_on) {
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  const std::int64_t blocks = host.live_blocks;
  host.fail_request(0);
  EXPECT_EQ(nullptr, extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree"));
  EXPECT_EQ(blocks, host.live_blocks);
  NonzeroTree* manager = extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree");
  ASSERT_NE(nullptr, manager);
  std::uint64_t root = 0;
  {
    CheckedTree tree(manager, &root);
    tree.insert(1);
    EXPECT_TRUE(tree.check());
  }
  manager->destroy(manager);
  extension->destroy(extension);
}

TEST_F(ExtensionTest, insertion_finding_and_removal_ask_the_host_for_nothing) {
  TreeExtension* extension = create();
  ASSERT_NE(nullptr, extension);
  NonzeroTree* manager = extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree");
  ASSERT_NE(nullptr, manager);
  const std::int64_t blocks = host.live_blocks;
  host.fail_request(0);
  std::uint64_t root = 0;
  {
    CheckedTree tree(manager, &root);
    for (std::int64_t key = 0; key < 100; ++key) tree.insert(key * 37 % 100);
    for (std::int64_t key = 0; key < 50; ++key) tree.remove(key);
    EXPECT_TRUE(tree.check());
  }
  EXPECT_EQ(blocks, host.live_blocks);
  // The planned fault is still waiting: no request was made since.
  EXPECT_EQ(nullptr, extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree"));
  manager->destroy(manager);
  extension->destroy(extension);
}

}  // namespace
}  // namespace sm::test
