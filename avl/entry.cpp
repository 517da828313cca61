// The entry points of the tree extension, which a host calls as it does the module's: qxextver (or qxextent), then the
// entry of the library's own name.
#include <qxesm/types.h>

#include <cstdint>

#include "avl/manager.hpp"

namespace {

// Hidden, unlike the module's handle of the same purpose: both libraries live in one process.
HostServices* services = nullptr;

}  // namespace

// Stores the service handle. Answers 0.
QXESM_API std::int32_t qxextent(HostServices* handle) {
  services = handle;
  return 0;
}

// Stores the interface version that the extension requires, 5 and 1, and the service handle. Answers 0.
QXESM_API std::int32_t qxextver(HostServices* handle, std::int32_t* major, std::int32_t* minor) {
  *major = 5;
  *minor = 1;
  return qxextent(handle);
}

// Builds the extension, a TreeExtension; `owner` is handed to the host's create pool, `unused` is not read. Answers
// null, with nothing left behind, before the service handle is there or when memory is short.
QXESM_API void* qxeavl(void* /*unused*/, void* owner) {
  return services ? sm::avl::create_extension(*services, owner) : nullptr;
}
