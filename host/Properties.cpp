// The property bag: typed entries under wide-string keys, kept in key order so enumeration is
// stable and hosts can show descriptors sorted without extra work.

#include <algorithm>
#include <cwchar>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "HostInternal.h"
#include "tessarofx/NLEProperties.h"

namespace tfx::host {
namespace {

// Reads a double as an int32: truncated toward zero, like CNLEValue::GetInt. A value outside
// the int32 range (or NaN) has no integer reading and counts as a kind mismatch.
HRESULT DoubleToInt32(double d, int32_t* out) {
  if (!(d > -2147483649.0 && d < 2147483648.0)) return NLE_E_TYPEMISMATCH;
  *out = static_cast<int32_t>(d);
  return NLE_S_OK;
}

// A CNLEValue reads as a number when its whole text is one. Interface values are excluded: their
// text is a pointer in hexadecimal, which can happen to consist of decimal digits only.
bool ValueAsDouble(const CNLEValue& v, double* out) { return !v.IsInterface() && v.GetDouble(out); }

uint32_t ClampToU32(size_t n) { return n > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(n); }

class PropertyBag final : public scombase::CUnknown, public INLEProperties {
 public:
  explicit PropertyBag(IUnknown* outer) : CUnknown(L"NLEProperties", outer) {}

  NLE_DECLARE_IUNKNOWN

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    if (iid == IID_INLEProperties) {
      return CUnknown::GetInterface(static_cast<INLEProperties*>(this), out);
    }
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }

  HRESULT SetInt(const wchar_t* key, int32_t value) override {
    return CallGuarded([&] { return Store(key, Entry(std::in_place_index<kInt>, value)); });
  }

  HRESULT GetInt(const wchar_t* key, int32_t* value) override {
    const Entry* e = nullptr;
    if (HRESULT hr = Lookup(key, value, &e); NLE_FAILED(hr)) return hr;
    double d = 0;
    switch (e->index()) {
      case kInt:
        *value = std::get<kInt>(*e);
        return NLE_S_OK;
      case kDouble:
        d = std::get<kDouble>(*e);
        break;
      case kValue:
        if (!ValueAsDouble(*std::get<kValue>(*e), &d)) return NLE_E_TYPEMISMATCH;
        break;
      default:
        return NLE_E_TYPEMISMATCH;
    }
    return DoubleToInt32(d, value);
  }

  HRESULT SetDouble(const wchar_t* key, double value) override {
    return CallGuarded([&] { return Store(key, Entry(std::in_place_index<kDouble>, value)); });
  }

  HRESULT GetDouble(const wchar_t* key, double* value) override {
    const Entry* e = nullptr;
    if (HRESULT hr = Lookup(key, value, &e); NLE_FAILED(hr)) return hr;
    switch (e->index()) {
      case kInt:
        *value = std::get<kInt>(*e);
        return NLE_S_OK;
      case kDouble:
        *value = std::get<kDouble>(*e);
        return NLE_S_OK;
      case kValue:
        return ValueAsDouble(*std::get<kValue>(*e), value) ? NLE_S_OK : NLE_E_TYPEMISMATCH;
      default:
        return NLE_E_TYPEMISMATCH;
    }
  }

  HRESULT SetString(const wchar_t* key, const wchar_t* value) override {
    if (!value) return key ? NLE_E_POINTER : NLE_E_INVALIDARG;
    return CallGuarded([&] { return Store(key, Entry(std::in_place_index<kString>, value)); });
  }

  HRESULT GetString(const wchar_t* key, wchar_t* buf, uint32_t capacity,
                    uint32_t* length) override {
    if (!key) return NLE_E_INVALIDARG;
    // A null buffer of capacity 0 asks for the length alone.
    if ((!buf && capacity > 0) || (!buf && !length)) return NLE_E_POINTER;
    // A failed read leaves an empty string rather than whatever the buffer held before.
    if (buf && capacity > 0) buf[0] = L'\0';
    const Entry* e = Find(key);
    if (!e) return NLE_E_INVALIDARG;
    if (e->index() != kString) return NLE_E_TYPEMISMATCH;
    const std::wstring& s = std::get<kString>(*e);
    if (length) *length = ClampToU32(s.size());
    if (buf && capacity > 0) {
      const size_t n = std::min<size_t>(s.size(), capacity - 1);
      std::wmemcpy(buf, s.data(), n);
      buf[n] = L'\0';
    }
    return NLE_S_OK;
  }

  HRESULT SetValue(const wchar_t* key, const CNLEValue& value) override {
    return CallGuarded([&] {
      return Store(key, Entry(std::in_place_index<kValue>, std::make_unique<CNLEValue>(value)));
    });
  }

  HRESULT GetValue(const wchar_t* key, CNLEValue* value) override {
    const Entry* e = nullptr;
    if (HRESULT hr = Lookup(key, value, &e); NLE_FAILED(hr)) return hr;
    if (e->index() != kValue) return NLE_E_TYPEMISMATCH;
    return CallGuarded([&] {
      *value = *std::get<kValue>(*e);
      return NLE_S_OK;
    });
  }

  HRESULT SetInterface(const wchar_t* key, IUnknown* value) override {
    if (!value) return key ? NLE_E_POINTER : NLE_E_INVALIDARG;
    return CallGuarded([&] { return Store(key, Entry(std::in_place_index<kInterface>, value)); });
  }

  HRESULT GetInterface(const wchar_t* key, IUnknown** value) override {
    if (value) *value = nullptr;
    const Entry* e = nullptr;
    if (HRESULT hr = Lookup(key, value, &e); NLE_FAILED(hr)) return hr;
    if (e->index() != kInterface) return NLE_E_TYPEMISMATCH;
    IUnknown* p = std::get<kInterface>(*e).get();
    p->AddRef();
    *value = p;
    return NLE_S_OK;
  }

  HRESULT Remove(const wchar_t* key) override {
    if (!key) return NLE_E_INVALIDARG;
    const auto it = entries_.find(std::wstring_view(key));
    if (it == entries_.end()) return NLE_E_INVALIDARG;
    // The node outlives the erase, so a Release that ends an object runs on a consistent bag.
    auto node = entries_.extract(it);
    keyIndexValid_ = false;
    return NLE_S_OK;
  }

  HRESULT CopyTo(INLEProperties* dst) override {
    if (!dst) return NLE_E_POINTER;
    if (dst == static_cast<INLEProperties*>(this)) return NLE_S_OK;
    return CallGuarded([&] {
      for (const auto& [key, e] : entries_) {
        const wchar_t* k = key.c_str();
        HRESULT hr = NLE_S_OK;
        switch (e.index()) {
          case kInt:
            hr = dst->SetInt(k, std::get<kInt>(e));
            break;
          case kDouble:
            hr = dst->SetDouble(k, std::get<kDouble>(e));
            break;
          case kString:
            hr = dst->SetString(k, std::get<kString>(e).c_str());
            break;
          case kValue:
            hr = dst->SetValue(k, *std::get<kValue>(e));
            break;
          case kInterface:
            hr = dst->SetInterface(k, std::get<kInterface>(e).get());
            break;
        }
        if (NLE_FAILED(hr)) return hr;
      }
      return NLE_S_OK;
    });
  }

  NLEPropertyKind GetKind(const wchar_t* key) override {
    const Entry* e = key ? Find(key) : nullptr;
    return e ? static_cast<NLEPropertyKind>(e->index() + 1) : kNLEPropNone;
  }

  uint32_t GetCount() override { return ClampToU32(entries_.size()); }

  const wchar_t* GetKeyAt(uint32_t index) override {
    if (index >= entries_.size()) return nullptr;
    // Hosts enumerate with a loop over GetKeyAt; an index of the keys keeps that linear.
    if (!keyIndexValid_) {
      try {
        keyIndex_.clear();
        keyIndex_.reserve(entries_.size());
        for (const auto& entry : entries_) keyIndex_.push_back(entry.first.c_str());
      } catch (const std::bad_alloc&) {
        return nullptr;
      }
      keyIndexValid_ = true;
    }
    return keyIndex_[index];
  }

 private:
  // Alternatives in the order of NLEPropertyKind, less one. Each moves without throwing, so an
  // entry can be replaced without ever leaving the bag half-changed; CNLEValue has no such move
  // and lives behind a pointer for that reason.
  enum : size_t { kInt, kDouble, kString, kValue, kInterface };
  using Entry =
      std::variant<int32_t, double, std::wstring, std::unique_ptr<CNLEValue>, NLEComPtr<IUnknown>>;

  const Entry* Find(const wchar_t* key) const {
    const auto it = entries_.find(std::wstring_view(key));
    return it == entries_.end() ? nullptr : &it->second;
  }

  // The common start of a read: checks the key and the out pointer and finds the entry.
  template <class Out>
  HRESULT Lookup(const wchar_t* key, Out* out, const Entry** entry) const {
    if (!key) return NLE_E_INVALIDARG;
    if (!out) return NLE_E_POINTER;
    *entry = Find(key);
    return *entry ? NLE_S_OK : NLE_E_INVALIDARG;
  }

  HRESULT Store(const wchar_t* key, Entry&& entry) {
    if (!key) return NLE_E_INVALIDARG;
    const auto it = entries_.find(std::wstring_view(key));
    if (it == entries_.end()) {
      entries_.emplace(key, std::move(entry));
      keyIndexValid_ = false;
      return NLE_S_OK;
    }
    // The old entry is released only after the bag holds the new one, so a Release that ends
    // an object sees a consistent bag.
    Entry old = std::move(it->second);
    it->second = std::move(entry);
    return NLE_S_OK;
  }

  std::map<std::wstring, Entry, std::less<>> entries_;
  std::vector<const wchar_t*> keyIndex_;
  bool keyIndexValid_ = false;
};

}  // namespace

scombase::CUnknown* NewPropertyBag(IUnknown* outer) { return new PropertyBag(outer); }

}  // namespace tfx::host
