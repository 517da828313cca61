// The objects that a caller sees: the extension and its tree managers, as tables of operations in a host pool.
#pragma once

#include <qxesm/host.h>

namespace sm::avl {

// The extension object, in a pool of its own together with every manager, or null with nothing left behind. `services`
// and `owner` go to the host's create pool.
TreeExtension* create_extension(HostServices& services, void* owner);

}  // namespace sm::avl
