// The module's entry points: the service handle, the extension object, versions.
#include <cstring>

#include "frame/instance.hpp"
#include "frame/memory.hpp"

HostServices* Exported_QXHandle = nullptr;

extern "C" int32_t qxextent(HostServices* handle) {
  Exported_QXHandle = handle;
  return 0;
}

extern "C" int32_t qxextver(HostServices* handle, int32_t* major, int32_t* minor) {
  *major = 5;
  *minor = 1;
  return qxextent(handle);
}

extern "C" int32_t qxsmGetReqVersion(SmExtension*, int32_t* major, int32_t* minor, int32_t* release) {
  *major = 5;
  *minor = 1;
  *release = 1;
  return 0;
}

extern "C" int32_t qxsmGetVersion(SmExtension*, int32_t* major, int32_t* minor, int32_t* release) {
  *major = 1;
  *minor = 0;
  *release = 0;
  return 0;
}

extern "C" int32_t qxsmDestroyExtension(SmExtension* extension) {
  if (!extension) return 0;
  if (extension->tree_extension) extension->tree_extension->destroy(extension->tree_extension);
  MemoryPool* pool = extension->pool;  // the object lives in it
  sm::destroy_pool(pool);
  return 0;
}

extern "C" SmInstance* CreateInstance(SmExtension* extension) {
  SmInstance* instance = nullptr;
  if (qxsmGetANewInstance(&instance) != SM_OK) {
    qxsmDestroyInstance(&instance);
    return nullptr;
  }
  instance->tree_extension = extension->tree_extension;
  return instance;
}

extern "C" SmExtension* qxesm(void*, void* owner) {
  MemoryPool* pool = sm::create_pool(SM_POOL_EXTENSION, owner, nullptr);
  if (!pool) return nullptr;
  SmExtension* extension = nullptr;
  if (sm::allocate(pool, 1, sm::Fill::zero, extension) != SM_OK) {
    sm::destroy_pool(pool);
    return nullptr;
  }
  extension->qxsmGetReqVersion = qxsmGetReqVersion;
  extension->qxsmGetVersion = qxsmGetVersion;
  extension->qxsmDestroyExtension = qxsmDestroyExtension;
  extension->pool = pool;
  extension->CreateInstance = CreateInstance;
  extension->tree_extension =
      static_cast<TreeExtension*>(Exported_QXHandle->load_extension(Exported_QXHandle, L"qxeavl", 6, nullptr));
  if (!extension->tree_extension) {
    sm::destroy_pool(pool);
    return nullptr;
  }
  return extension;
}

extern "C" void qxvercn1(char* buffer) {
  static constexpr char kRecord[208] = "qxesm 1.0.0, interface 5.1.1; sparse and packed matrix extension";
  std::memcpy(buffer, kRecord, sizeof kRecord);
}
