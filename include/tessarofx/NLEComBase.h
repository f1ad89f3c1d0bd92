// Component model shared by the host and the plug-in: identifiers, result codes, IUnknown,
// the counted pointer NLEComPtr and the aggregatable object base scombase::CUnknown.
//
// Threading: reference counts are atomic, so an object may be shared between threads; all other
// state of an object is used by one thread at a time unless its interface says otherwise.
#pragma once

#include <atomic>
#include <cstdint>
#include <cstring>
#include <memory>

#include "tessarofx/Export.h"

typedef int32_t HRESULT;

// 128-bit identifier of an interface or a class, laid out as the usual GUID record.
struct GUID {
  uint32_t Data1;
  uint16_t Data2;
  uint16_t Data3;
  uint8_t Data4[8];
};
typedef GUID IID;
typedef GUID CLSID;
typedef const GUID& REFIID;
typedef const GUID& REFCLSID;

inline bool operator==(const GUID& a, const GUID& b) { return std::memcmp(&a, &b, sizeof a) == 0; }
inline bool operator!=(const GUID& a, const GUID& b) { return !(a == b); }

// Result codes. Success is 0; failures have the top bit set.
constexpr HRESULT NLE_S_OK = 0;
constexpr HRESULT NLE_S_FALSE = 1;
constexpr HRESULT NLE_E_NOTIMPL = static_cast<HRESULT>(0x80000001u);
constexpr HRESULT NLE_E_INVALIDARG = static_cast<HRESULT>(0x80000003u);  // bad argument, not found
constexpr HRESULT NLE_E_RESOURCE = static_cast<HRESULT>(0x80000008u);    // resource unavailable
constexpr HRESULT NLE_E_NOINTERFACE = static_cast<HRESULT>(0x80004002u);
constexpr HRESULT NLE_E_POINTER = static_cast<HRESULT>(0x80004003u);
constexpr HRESULT NLE_E_OUTOFMEMORY = static_cast<HRESULT>(0x8007000Eu);
constexpr HRESULT NLE_E_TYPEMISMATCH = static_cast<HRESULT>(0x80020005u);
constexpr HRESULT NLE_E_CLASSNOTREG = static_cast<HRESULT>(0x80040154u);

inline bool NLE_SUCCEEDED(HRESULT hr) { return hr >= 0; }
inline bool NLE_FAILED(HRESULT hr) { return hr < 0; }

// A short English meaning of a result code, for messages ("not implemented", ...).
extern "C" TFX_HOST_API const char* NLEResultText(HRESULT hr);

extern "C++" {
TFX_HOST_API extern const IID IID_IUnknown;
}

struct IUnknown {
  virtual HRESULT QueryInterface(REFIID iid, void** out) = 0;
  virtual uint32_t AddRef() = 0;
  virtual uint32_t Release() = 0;

 protected:
  ~IUnknown() = default;  // objects are destroyed through Release, never through an interface
};

// Counted pointer. Assigning a raw pointer adds a reference; Attach takes one over.
template <class T>
class NLEComPtr {
 public:
  NLEComPtr() = default;
  NLEComPtr(T* p) : p_(p) {  // NOLINT: implicit on purpose, as raw pointers are handed around
    if (p_) p_->AddRef();
  }
  NLEComPtr(const NLEComPtr& o) : NLEComPtr(o.p_) {}
  NLEComPtr(NLEComPtr&& o) noexcept : p_(o.p_) { o.p_ = nullptr; }
  ~NLEComPtr() { Reset(); }

  NLEComPtr& operator=(T* p) {
    if (p) p->AddRef();
    Reset();
    p_ = p;
    return *this;
  }
  NLEComPtr& operator=(const NLEComPtr& o) { return *this = o.p_; }
  NLEComPtr& operator=(NLEComPtr&& o) noexcept {
    if (this != std::addressof(o)) {  // operator& is taken by the out-parameter form
      Reset();
      p_ = o.p_;
      o.p_ = nullptr;
    }
    return *this;
  }

  void Reset() {
    if (p_) {
      T* p = p_;
      p_ = nullptr;
      p->Release();
    }
  }
  void Attach(T* p) {
    Reset();
    p_ = p;
  }
  T* Detach() {
    T* p = p_;
    p_ = nullptr;
    return p;
  }
  // Address for an out-parameter: releases what is held first.
  T** operator&() {
    Reset();
    return &p_;
  }
  T** GetAddressOf() { return operator&(); }

  // Asks the held object for another interface into *out (a new reference for the caller).
  template <class U>
  HRESULT QueryInterface(REFIID iid, U** out) const {
    if (!out) return NLE_E_POINTER;
    *out = nullptr;
    if (!p_) return NLE_E_POINTER;
    return p_->QueryInterface(iid, reinterpret_cast<void**>(out));
  }

  T* get() const { return p_; }
  T* operator->() const { return p_; }
  T& operator*() const { return *p_; }
  explicit operator bool() const { return p_ != nullptr; }
  operator T*() const { return p_; }  // NOLINT: handing the pointer to an interface call

 private:
  T* p_ = nullptr;
};

namespace scombase {

// The object's own IUnknown, which an aggregating outer object calls to reach it.
struct INonDelegatingUnknown {
  virtual HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) = 0;
  virtual uint32_t NonDelegatingAddRef() = 0;
  virtual uint32_t NonDelegatingRelease() = 0;

 protected:
  ~INonDelegatingUnknown() = default;
};

// Base of every component object. Holds the reference count and the owner: the outer unknown
// when the object is aggregated, else the object's own non-delegating unknown. A derived class
// answers its interfaces in NonDelegatingQueryInterface and forwards QueryInterface, AddRef and
// Release of its interfaces to GetOwner(), so that aggregation keeps one identity and one count.
class CUnknown : public INonDelegatingUnknown {
 public:
  CUnknown(const wchar_t* name, IUnknown* outer) : name_(name), outer_(outer), inner_(this) {}
  CUnknown(const CUnknown&) = delete;
  CUnknown& operator=(const CUnknown&) = delete;

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    if (iid == IID_IUnknown) return GetInterface(static_cast<IUnknown*>(&inner_), out);
    *out = nullptr;
    return NLE_E_NOINTERFACE;
  }
  uint32_t NonDelegatingAddRef() override { return ++ref_; }
  uint32_t NonDelegatingRelease() override {
    const uint32_t left = --ref_;
    if (left == 0) {
      ref_ = 1;  // guards against re-entrant destruction from the destructor
      delete this;
    }
    return left;
  }
  virtual ~CUnknown() = default;

  // The object's own (non-delegating) IUnknown: what an aggregating outer object keeps.
  IUnknown* GetNonDelegatingUnknown() { return &inner_; }
  // The unknown that QueryInterface, AddRef and Release of this object's interfaces go to.
  IUnknown* GetOwner() { return outer_ ? outer_ : &inner_; }
  const wchar_t* GetName() const { return name_; }
  uint32_t GetRefCount() const { return ref_.load(); }

  // Hands out `iface` with a reference added (for NonDelegatingQueryInterface overrides).
  template <class I>
  static HRESULT GetInterface(I* iface, void** out) {
    if (!out) return NLE_E_POINTER;
    *out = iface;
    iface->AddRef();
    return NLE_S_OK;
  }

 private:
  // A real IUnknown that routes to the non-delegating operations, so no vtable is reinterpreted.
  class Inner final : public IUnknown {
   public:
    explicit Inner(CUnknown* self) : self_(self) {}
    virtual ~Inner() = default;
    HRESULT QueryInterface(REFIID iid, void** out) override {
      return self_->NonDelegatingQueryInterface(iid, out);
    }
    uint32_t AddRef() override { return self_->NonDelegatingAddRef(); }
    uint32_t Release() override { return self_->NonDelegatingRelease(); }

   private:
    CUnknown* self_;
  };

  const wchar_t* name_;
  IUnknown* outer_;
  Inner inner_;
  std::atomic<uint32_t> ref_{0};
};

}  // namespace scombase

// Implements IUnknown's three operations of a class derived from scombase::CUnknown by
// forwarding them to the owner.
#define NLE_DECLARE_IUNKNOWN                                  \
  HRESULT QueryInterface(REFIID iid, void** out) override {   \
    return GetOwner()->QueryInterface(iid, out);              \
  }                                                           \
  uint32_t AddRef() override { return GetOwner()->AddRef(); } \
  uint32_t Release() override { return GetOwner()->Release(); }
