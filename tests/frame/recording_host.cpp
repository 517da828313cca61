#include "frame/recording_host.hpp"

#include <algorithm>
#include <cstring>
#include <utility>

namespace sm::test {
namespace {

constexpr std::uint64_t kPoison = UINT64_C(0xD15EA5EDD15EA5ED);

template <class T>
void poison(T& table) {
  for (std::size_t at = 0; at < sizeof table; at += sizeof kPoison) {
    std::memcpy(reinterpret_cast<char*>(&table) + at, &kPoison, sizeof kPoison);
  }
}

}  // namespace

// Every proxy begins with the table that the module sees, so that a table's address is its proxy's. `before` is a copy
// that shows whether anything was written there; `inner` is the object behind, null once that was destroyed.
struct RecordingHost::Services {
  HostServices table;
  HostServices before;
  HostServices* inner;
  RecordingHost* host;

  static MemoryPool* create_pool(HostServices* kernel, const PoolParms* parms, void* owner, const char* name);
  static void* load_extension(HostServices* kernel, const wchar_t* name, std::int64_t length, void* zero);
};

struct RecordingHost::Pool {
  MemoryPool table;
  MemoryPool before;
  MemoryPool* inner;
  RecordingHost* host;

  static Pool* of(MemoryPool* pool) { return reinterpret_cast<Pool*>(pool); }
  static void destroy(MemoryPool* pool);
  static void* allocate(MemoryPool* pool, std::uint64_t bytes, std::uint32_t flags);
  static void free(MemoryPool* pool, void* block);
};

struct RecordingHost::Extension {
  TreeExtension table;
  TreeExtension before;
  TreeExtension* inner;
  RecordingHost* host;

  static void destroy(TreeExtension* extension);
  static NonzeroTree* create(TreeExtension* extension, const TreeParms* parms, void* zero, const char* label);
};

struct RecordingHost::Inner {
  TreeInner table;
  Tree* tree;

  static void reset(TreeInner* inner, std::int64_t one, std::int64_t one_again);
  static void release(TreeInner* inner);
};

struct RecordingHost::Tree {
  NonzeroTree table;
  NonzeroTree* inner;
  RecordingHost* host;
  Inner object;

  static Tree* of(NonzeroTree* tree) { return reinterpret_cast<Tree*>(tree); }
  static NonzeroTree* behind(NonzeroTree* tree) { return of(tree)->inner; }
  static void destroy(NonzeroTree* tree);
  void log(const std::string& what) { host->events.push_back(what + (table.cleared_word ? "" : ", word cleared")); }
};

void RecordingHost::Pool::destroy(MemoryPool* pool) {
  Pool* self = of(pool);
  if (!self->inner) {
    ++self->host->offences_;
    return;
  }
  self->inner->destroy(self->inner);
  self->inner = nullptr;
}

void* RecordingHost::Pool::allocate(MemoryPool* pool, std::uint64_t bytes, std::uint32_t flags) {
  Pool* self = of(pool);
  if (!self->inner) {
    ++self->host->offences_;
    return nullptr;
  }
  self->host->blocks.push_back({bytes, flags});
  void* block = self->inner->allocate(self->inner, bytes, flags);
  if (block && !(flags & SM_POOL_ZERO)) std::memset(block, 0xA5, bytes);
  return block;
}

void RecordingHost::Pool::free(MemoryPool* pool, void* block) {
  Pool* self = of(pool);
  if (self->inner) {
    self->inner->free(self->inner, block);
  } else {
    ++self->host->offences_;
  }
}

MemoryPool* RecordingHost::Services::create_pool(HostServices* kernel, const PoolParms* parms, void* owner,
                                                 const char* name) {
  auto* self = reinterpret_cast<Services*>(kernel);
  self->host->pools.push_back({*parms, owner, name != nullptr, name ? name : ""});
  MemoryPool* inner = self->inner->create_pool(self->inner, parms, owner, name);
  if (!inner) return nullptr;
  auto proxy = std::make_unique<Pool>();
  poison(proxy->table);
  proxy->table.destroy = Pool::destroy;
  proxy->table.allocate = Pool::allocate;
  proxy->table.free = Pool::free;
  std::memcpy(&proxy->before, &proxy->table, sizeof proxy->table);
  proxy->inner = inner;
  proxy->host = self->host;
  self->host->pool_proxies_.push_back(std::move(proxy));
  return &self->host->pool_proxies_.back()->table;
}

void* RecordingHost::Services::load_extension(HostServices* kernel, const wchar_t* name, std::int64_t length,
                                              void* zero) {
  auto* self = reinterpret_cast<Services*>(kernel);
  self->host->extensions.push_back({std::wstring(name, static_cast<std::size_t>(length)), length, zero});
  void* inner = self->inner->load_extension(self->inner, name, length, zero);
  if (!inner) return nullptr;
  auto proxy = std::make_unique<Extension>();
  poison(proxy->table);
  proxy->table.destroy = Extension::destroy;
  proxy->table.create_tree_manager = Extension::create;
  std::memcpy(&proxy->before, &proxy->table, sizeof proxy->table);
  proxy->inner = static_cast<TreeExtension*>(inner);
  proxy->host = self->host;
  self->host->extension_proxies_.push_back(std::move(proxy));
  return &self->host->extension_proxies_.back()->table;
}

void RecordingHost::Extension::destroy(TreeExtension* extension) {
  auto* self = reinterpret_cast<Extension*>(extension);
  if (!self->inner) {
    ++self->host->offences_;
    return;
  }
  self->host->events.emplace_back("extension destroyed");
  self->inner->destroy(self->inner);
  self->inner = nullptr;
}

NonzeroTree* RecordingHost::Extension::create(TreeExtension* extension, const TreeParms* parms, void* zero,
                                              const char* label) {
  auto* self = reinterpret_cast<Extension*>(extension);
  self->host->trees.push_back({*parms, zero, label ? label : ""});
  NonzeroTree* inner = self->inner->create_tree_manager(self->inner, parms, zero, label);
  if (!inner) return nullptr;
  auto proxy = std::make_unique<Tree>();
  poison(proxy->table);
  proxy->table.destroy = Tree::destroy;
  proxy->table.insert = [](NonzeroTree* t, std::uint64_t* root, NonzeroNode* node) {
    return Tree::behind(t)->insert(Tree::behind(t), root, node);
  };
  proxy->table.find = [](NonzeroTree* t, std::uint64_t* root, const std::int64_t* key) {
    return Tree::behind(t)->find(Tree::behind(t), root, key);
  };
  proxy->table.remove = [](NonzeroTree* t, std::uint64_t* root, const std::int64_t* key) {
    return Tree::behind(t)->remove(Tree::behind(t), root, key);
  };
  proxy->table.first = [](NonzeroTree* t, std::uint64_t* root) {
    return Tree::behind(t)->first(Tree::behind(t), root);
  };
  proxy->object.table.reset = Inner::reset;
  proxy->object.table.release = Inner::release;
  proxy->object.tree = proxy.get();
  proxy->table.inner = self->host->inner_objects_ ? &proxy->object.table : nullptr;
  proxy->inner = inner;
  proxy->host = self->host;
  self->host->tree_proxies_.push_back(std::move(proxy));
  return &self->host->tree_proxies_.back()->table;
}

void RecordingHost::Inner::reset(TreeInner* inner, std::int64_t one, std::int64_t one_again) {
  Tree* tree = reinterpret_cast<Inner*>(inner)->tree;
  tree->log("inner reset " + std::to_string(one) + " " + std::to_string(one_again));
}

void RecordingHost::Inner::release(TreeInner* inner) { reinterpret_cast<Inner*>(inner)->tree->log("inner released"); }

void RecordingHost::Tree::destroy(NonzeroTree* tree) {
  Tree* self = of(tree);
  if (!self->inner) {
    ++self->host->offences_;
    return;
  }
  self->log("tree destroyed");
  if (TreeInner* hidden = self->inner->inner) {  // the module never saw it: its road is ours to go
    hidden->reset(hidden, 1, 1);
    self->inner->cleared_word = nullptr;
    hidden->release(hidden);
  }
  self->inner->destroy(self->inner);
  self->inner = nullptr;
}

RecordingHost::RecordingHost(HostServices* inner) : services_(std::make_unique<Services>()) {
  poison(services_->table);
  services_->table.create_pool = Services::create_pool;
  services_->table.load_extension = Services::load_extension;
  std::memcpy(&services_->before, &services_->table, sizeof services_->table);
  services_->inner = inner;
  services_->host = this;
}

RecordingHost::~RecordingHost() = default;

HostServices* RecordingHost::services() { return &services_->table; }

namespace {

template <class Proxies>
std::int64_t live(const Proxies& proxies) {
  return std::count_if(proxies.begin(), proxies.end(), [](const auto& proxy) { return proxy->inner != nullptr; });
}

template <class Proxy>
bool written_to(const Proxy& proxy) {
  return std::memcmp(&proxy->table, &proxy->before, sizeof proxy->table) != 0;
}

}  // namespace

std::int64_t RecordingHost::live_pools() const { return live(pool_proxies_); }
std::int64_t RecordingHost::live_trees() const { return live(tree_proxies_); }
std::int64_t RecordingHost::live_extensions() const { return live(extension_proxies_); }

std::int64_t RecordingHost::offences() const {
  std::int64_t found = offences_ + (written_to(services_) ? 1 : 0);
  for (const auto& proxy : pool_proxies_) found += written_to(proxy) ? 1 : 0;
  for (const auto& proxy : extension_proxies_) found += written_to(proxy) ? 1 : 0;
  return found;
}

}  // namespace sm::test
