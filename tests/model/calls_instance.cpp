// Instances and versions.
#include "model/machine.hpp"

namespace sm::test {

namespace {

void call_instance(Machine& m) {
  const bool plain = m.random.chance(50);
  m.begin(plain ? "qxsmGetANewInstance" : "CreateInstance");
  SmInstance* instance = nullptr;
  const SmStatus made = plain ? qxsmGetANewInstance(&instance) : SM_OK;
  if (!plain) instance = CreateInstance(m.extension());
  m.answer(instance || plain ? made : SM_NO_MEMORY, SM_OK);
  // A half-built one is only good for being destroyed.
  if (instance && made == SM_OK) {
    SmMatrix* matrix = nullptr;
    const SmStatus status = instance->functions->qxsmnewsd(instance, &matrix, 3);
    if (status != SM_OK || instance->matrix_count != 1) m.wrong("a matrix of an instance");
  }
  m.begin("qxsmDestroyInstance");
  m.answer(qxsmDestroyInstance(&instance), SM_OK);
  if (instance) m.wrong("the handle is still there");
}

void call_versions(Machine& m) {
  std::int32_t v[3] = {-1, -1, -1};
  const bool own = m.random.chance(50);
  m.begin(own ? "qxsmGetVersion" : "qxsmGetReqVersion");
  m.answer((own ? qxsmGetVersion : qxsmGetReqVersion)(m.extension(), v, v + 1, v + 2), SM_OK);
  if (own ? v[0] != 1 || v[1] != 0 || v[2] != 0 : v[0] != 5 || v[1] != 1 || v[2] != 1) m.wrong("version");
}

}  // namespace

void add_instance_calls(std::vector<Call>& list) { list.insert(list.end(), {{call_instance, 2}, {call_versions, 2}}); }

}  // namespace sm::test
