// C++ handles for the embedded host and the module in it (C++17). They own what they hold, move and do not copy, and
// report failure by being false: nothing here throws.
//
//   qxhost::Host host;
//   qxhost::Extension extension(host);
//   qxhost::Instance instance(extension);
//   if (!instance) { std::fputs(host.last_error(), stderr); return 1; }
//   auto a = qxhost::Matrix::symmetric_sparse(instance, n);
//   if (!a) return a.status();
//   const SmFunctionTable& sm = instance.fn();
//   sm.qxsmassign(a, row, col, 1, value);
//
// Each handle refers to the one before it, so they are declared in this order and end in the opposite one: matrices
// before their instance, instances before the extension, the extension before the host. A moved-from handle is false.
#ifndef QXHOST_QXHOST_HPP
#define QXHOST_QXHOST_HPP

#include <qxesm/instance.h>
#include <qxhost/qxhost.h>

#include <string_view>
#include <utility>

namespace qxhost {

// A host. False when it could not be had.
class Host {
 public:
  explicit Host(const QxHostOptions& options = {}) noexcept : host_(qxhost_create(&options)) {}
  Host(Host&& other) noexcept : host_(std::exchange(other.host_, nullptr)) {}
  Host& operator=(Host&& other) noexcept {
    std::swap(host_, other.host_);
    return *this;
  }
  ~Host() { qxhost_destroy(host_); }

  explicit operator bool() const noexcept { return host_ != nullptr; }
  // For the functions of qxhost.h.
  [[nodiscard]] QxHost* get() const noexcept { return host_; }
  [[nodiscard]] HostServices* services() const noexcept { return host_ ? qxhost_services(host_) : nullptr; }

  // False when memory is short or the folder is null or empty.
  bool add_search_path(const char* directory) noexcept {
    return host_ && qxhost_add_search_path(host_, directory) == 0;
  }
  // What the entry of lib<name>.so answers, or null.
  [[nodiscard]] void* load(std::wstring_view name) noexcept {
    return host_ ? qxhost_load_extension(host_, name.data(), static_cast<int64_t>(name.size())) : nullptr;
  }
  [[nodiscard]] const char* last_error() const noexcept {
    return host_ ? qxhost_last_error(host_) : "the host could not be created";
  }

  [[nodiscard]] QxHostUsage usage() const noexcept { return host_ ? qxhost_usage(host_) : QxHostUsage{}; }
  void set_memory_ceiling(uint64_t bytes) noexcept {
    if (host_) qxhost_set_memory_ceiling(host_, bytes);
  }
  void set_kept_memory(std::uint64_t bytes) noexcept {
    if (host_) qxhost_set_kept_memory(host_, bytes);
  }
  void trim() noexcept {
    if (host_) qxhost_trim(host_);
  }
  [[nodiscard]] bool ceiling_was_met() const noexcept { return host_ && qxhost_ceiling_was_met(host_) != 0; }

 private:
  QxHost* host_;
};

// The module, loaded into a host. False when it could not be: the host's last_error says why.
class Extension {
 public:
  explicit Extension(Host& host) noexcept : extension_(static_cast<SmExtension*>(host.load(L"qxesm"))) {}
  Extension(Extension&& other) noexcept : extension_(std::exchange(other.extension_, nullptr)) {}
  Extension& operator=(Extension&& other) noexcept {
    std::swap(extension_, other.extension_);
    return *this;
  }
  ~Extension() {
    if (extension_) extension_->qxsmDestroyExtension(extension_);
  }

  explicit operator bool() const noexcept { return extension_ != nullptr; }
  [[nodiscard]] SmExtension* get() const noexcept { return extension_; }

 private:
  SmExtension* extension_;
};

// An instance of the module. False when the extension is, or when memory is short.
class Instance {
 public:
  explicit Instance(Extension& extension) noexcept
      : instance_(extension ? extension.get()->CreateInstance(extension.get()) : nullptr) {}
  Instance(Instance&& other) noexcept : instance_(std::exchange(other.instance_, nullptr)) {}
  Instance& operator=(Instance&& other) noexcept {
    std::swap(instance_, other.instance_);
    return *this;
  }
  ~Instance() {
    if (instance_) instance_->functions->qxsmDestroyInstance(&instance_);
  }

  explicit operator bool() const noexcept { return instance_ != nullptr; }
  [[nodiscard]] SmInstance* get() const noexcept { return instance_; }
  // The 43 operations. Only of an instance that is true.
  [[nodiscard]] const SmFunctionTable& fn() const noexcept { return *instance_->functions; }

 private:
  SmInstance* instance_;
};

// A matrix of an instance: passes as SmMatrix* wherever an operation wants one. False when it could not be made as
// asked; status() then has the module's answer.
class Matrix {
 public:
  // Typed, without a size; qxsmresize gives it one.
  Matrix(Instance& instance, int32_t kind, int32_t format) noexcept : Matrix(instance) {
    if (instance_) status_ = instance_->functions->qxsmnew(instance_, &matrix_, kind, format);
  }
  // n x n, open for qxsmassign, with a zero diagonal.
  [[nodiscard]] static Matrix symmetric_sparse(Instance& instance, int64_t n) noexcept {
    Matrix made(instance);
    if (made.instance_) made.status_ = instance.fn().qxsmnewss(made.instance_, &made.matrix_, n);
    return made;
  }
  // n x n, packed upper triangle by columns.
  [[nodiscard]] static Matrix symmetric_dense(Instance& instance, int64_t n) noexcept {
    Matrix made(instance);
    if (made.instance_) made.status_ = instance.fn().qxsmnewds(made.instance_, &made.matrix_, n);
    return made;
  }
  [[nodiscard]] static Matrix general_sparse(Instance& instance, int64_t rows, int64_t cols) noexcept {
    Matrix made(instance);
    if (made.instance_) made.status_ = instance.fn().qxsmnewsg(made.instance_, &made.matrix_, rows, cols);
    return made;
  }
  [[nodiscard]] static Matrix diagonal(Instance& instance, int64_t n) noexcept {
    Matrix made(instance);
    if (made.instance_) made.status_ = instance.fn().qxsmnewsd(made.instance_, &made.matrix_, n);
    return made;
  }

  Matrix(Matrix&& other) noexcept
      : instance_(other.instance_),
        matrix_(std::exchange(other.matrix_, nullptr)),
        status_(std::exchange(other.status_, SM_UNTYPED)) {}
  Matrix& operator=(Matrix&& other) noexcept {
    std::swap(instance_, other.instance_);
    std::swap(matrix_, other.matrix_);
    std::swap(status_, other.status_);
    return *this;
  }
  ~Matrix() {
    if (matrix_) instance_->functions->qxsmDestroyMatrix(instance_, &matrix_);
  }

  explicit operator bool() const noexcept { return status_ == SM_OK; }
  operator SmMatrix*() const noexcept { return matrix_; }
  SmMatrix* operator->() const noexcept { return matrix_; }
  [[nodiscard]] SmMatrix* get() const noexcept { return matrix_; }
  // What the module answered when the matrix was made; 101 when there is no instance to make it in.
  [[nodiscard]] SmStatus status() const noexcept { return status_; }

 private:
  explicit Matrix(Instance& instance) noexcept : instance_(instance.get()) {}

  SmInstance* instance_;
  SmMatrix* matrix_ = nullptr;
  SmStatus status_ = SM_NO_MEMORY;
};

}  // namespace qxhost

#endif
