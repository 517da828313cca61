#include <gtest/gtest.h>

#include <array>
#include <cstring>

#include "support/module_test.hpp"

namespace sm::test {
namespace {

struct Slot {
  const char* name;
  void (*operation)();
};

#define SLOT(name) \
  Slot { #name, reinterpret_cast < void (*)()>(&name) }

// Hosts call by slot number: this order is what they were built with.
const std::array<Slot, 43> kSlots = {SLOT(qxsmDestroyInstance),
                                     SLOT(qxsmnew),
                                     SLOT(qxsmDestroyMatrix),
                                     SLOT(qxsmclose),
                                     SLOT(qxsmdelete),
                                     SLOT(qxsmresize),
                                     SLOT(qxsmzscp),
                                     SLOT(qxsmsoldirect),
                                     SLOT(qxsmsolioc),
                                     SLOT(qxsmAddSS),
                                     SLOT(qxsmAddSS),
                                     SLOT(qxsmassign),
                                     SLOT(qxsmget),
                                     SLOT(qxsminvdiag),
                                     SLOT(qxsminv),
                                     SLOT(qxsmUpdateGinv),
                                     SLOT(qxsmsetee),
                                     SLOT(qxsmpivot),
                                     SLOT(qxsmcke),
                                     SLOT(qxsminvquad),
                                     SLOT(qxsminvquadv),
                                     SLOT(qxsmquad),
                                     SLOT(qxsmquadv),
                                     SLOT(qxsmsubst),
                                     SLOT(qxsmhermite),
                                     SLOT(qxsmdense),
                                     SLOT(qxsmlogdet),
                                     SLOT(qxsmrank),
                                     SLOT(qxsmtrace),
                                     SLOT(qxsmtraceAB),
                                     SLOT(qxsmdiag),
                                     SLOT(qxsmmults),
                                     SLOT(qxsmIsDiag),
                                     SLOT(qxsmDenseQuad),
                                     SLOT(qxsmvaxpy),
                                     SLOT(qxsmbilin),
                                     SLOT(qxsmclone),
                                     SLOT(qxsmconvert),
                                     SLOT(qxsmfact),
                                     SLOT(qxsmnewss),
                                     SLOT(qxsmnewds),
                                     SLOT(qxsmnewsg),
                                     SLOT(qxsmnewsd)};

class Table : public ModuleTest {};

TEST_P(Table, holds_the_43_operations_in_slot_order) {
  std::array<void (*)(), 43> slots{};
  static_assert(sizeof slots == sizeof(SmFunctionTable));
  std::memcpy(slots.data(), instance()->functions, sizeof slots);
  for (std::size_t k = 0; k < slots.size(); ++k) EXPECT_EQ(slots[k], kSlots[k].operation) << k << ' ' << kSlots[k].name;
}

TEST_P(Table, slots_9_and_10_hold_the_same_operation) { EXPECT_EQ(fn().qxsmAddSS, fn().qxsmAddSS_10); }

TEST_P(Table, every_instance_has_a_table_of_its_own) {
  SmInstance* other = CreateInstance(session().extension());
  ASSERT_NE(other, nullptr);
  EXPECT_NE(other->functions, instance()->functions);
  EXPECT_EQ(std::memcmp(other->functions, instance()->functions, sizeof(SmFunctionTable)), 0);
  EXPECT_EQ(other->functions->qxsmDestroyInstance(&other), SM_OK);
}

INSTANTIATE_BOTH_HOSTS(Table);

}  // namespace
}  // namespace sm::test
