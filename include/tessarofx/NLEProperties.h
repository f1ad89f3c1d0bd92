// Property bags: the key/value objects through which filter descriptors, parameter descriptors and
// parameter values travel between host and plug-in, the typed value CNLEValue, and the keys.
#pragma once

#include <cstdint>
#include <cstdio>
#include <cwchar>
#include <cwctype>
#include <string>

#include "tessarofx/NLEComBase.h"

extern "C++" {
TFX_HOST_API extern const IID IID_INLEProperties;
TFX_HOST_API extern const CLSID CLSID_NLEProperties;
}

// A value written with its type: a type name ("double", "int", ...) and the text of the value.
// Two values are equal when both the type name and the text are equal, so 1 (int) and 1.0
// (double) differ, and doubles compare at the six decimals of their text.
class CNLEValue {
 public:
  // Type name of a value that holds an interface pointer (it holds a reference).
  static constexpr const wchar_t* kInterfaceType = L"CNLEPtr<IUnknown>";

  CNLEValue() = default;
  template <class T>
  explicit CNLEValue(T v) {
    Set(v);
  }
  CNLEValue(const CNLEValue& o) : type_(o.type_), text_(o.text_) { AddRefUnknownInterface(); }
  CNLEValue& operator=(const CNLEValue& o) {
    if (this != &o) {
      ReleaseUnknownInterface();
      type_ = o.type_;
      text_ = o.text_;
      AddRefUnknownInterface();
    }
    return *this;
  }
  ~CNLEValue() { ReleaseUnknownInterface(); }

  template <class T>
  HRESULT Set(T& v) {
    ReleaseUnknownInterface();
    const HRESULT hr = T2String<T>(v, type_, text_);
    AddRefUnknownInterface();
    return hr;
  }
  template <class T>
  HRESULT Set(const T& v) {
    T copy = v;
    return Set<T>(copy);
  }

  // Formats v into a type name and a text, as a 128-character swprintf buffer holds it.
  template <class T>
  static HRESULT T2String(T& v, std::wstring& type, std::wstring& text) {
    return Format(v, type, text);
  }

  bool operator==(const CNLEValue& o) const { return type_ == o.type_ && text_ == o.text_; }
  bool operator!=(const CNLEValue& o) const { return !(*this == o); }

  const std::wstring& TypeName() const { return type_; }
  const std::wstring& Text() const { return text_; }
  bool IsInterface() const { return SameNoCase(type_, kInterfaceType); }

  // Reads the text back as a number. False when the text is not a complete number.
  bool GetDouble(double* out) const {
    if (!out || text_.empty()) return false;
    wchar_t* end = nullptr;
    const double v = std::wcstod(text_.c_str(), &end);
    if (end == text_.c_str() || *end != L'\0') return false;
    *out = v;
    return true;
  }
  bool GetInt(int64_t* out) const {
    double d = 0;
    if (!out || !GetDouble(&d)) return false;
    *out = static_cast<int64_t>(d);
    return true;
  }
  // The interface held by an interface value (no reference added), else null.
  IUnknown* GetInterface() const {
    if (!IsInterface()) return nullptr;
    return reinterpret_cast<IUnknown*>(
        static_cast<uintptr_t>(std::wcstoull(text_.c_str(), nullptr, 16)));
  }

  // Builds a value from a type name and a text as they were stored (no formatting).
  static CNLEValue FromParts(const std::wstring& type, const std::wstring& text) {
    CNLEValue v;
    v.type_ = type;
    v.text_ = text;
    v.AddRefUnknownInterface();
    return v;
  }

 private:
  static bool SameNoCase(const std::wstring& a, const wchar_t* b) {
    size_t i = 0;
    for (; i < a.size() && b[i]; ++i) {
      if (std::towlower(static_cast<wint_t>(a[i])) != std::towlower(static_cast<wint_t>(b[i])))
        return false;
    }
    return i == a.size() && b[i] == L'\0';
  }
  void ReleaseUnknownInterface() {
    if (IUnknown* p = GetInterface()) p->Release();
    if (IsInterface()) text_.clear();
  }
  void AddRefUnknownInterface() {
    if (IUnknown* p = GetInterface()) p->AddRef();
  }

  template <class V>
  static HRESULT Print(const wchar_t* name, const wchar_t* fmt, V v, std::wstring& type,
                       std::wstring& text) {
    wchar_t buf[128];
    const int n = std::swprintf(buf, 128, fmt, v);
    type = name;
    text.assign(buf, n < 0 ? 0 : static_cast<size_t>(n));
    return n < 0 ? NLE_E_INVALIDARG : NLE_S_OK;
  }
  static HRESULT Format(char v, std::wstring& t, std::wstring& s) {
    return Print(L"char", L"%lc", static_cast<wint_t>(static_cast<unsigned char>(v)), t, s);
  }
  static HRESULT Format(unsigned char v, std::wstring& t, std::wstring& s) {
    return Print(L"unsigned char", L"%lc", static_cast<wint_t>(v), t, s);
  }
  static HRESULT Format(short v, std::wstring& t, std::wstring& s) {
    return Print(L"short", L"%d", static_cast<int>(v), t, s);
  }
  static HRESULT Format(unsigned short v, std::wstring& t, std::wstring& s) {
    return Print(L"unsigned short", L"%d", static_cast<int>(v), t, s);
  }
  static HRESULT Format(int v, std::wstring& t, std::wstring& s) {
    return Print(L"int", L"%d", v, t, s);
  }
  static HRESULT Format(unsigned int v, std::wstring& t, std::wstring& s) {
    return Print(L"unsigned int", L"%u", v, t, s);
  }
  static HRESULT Format(long v, std::wstring& t, std::wstring& s) {
    return Print(L"long", L"%ld", v, t, s);
  }
  // The signed format is kept on purpose: values of 2^63 and above read back negative.
  static HRESULT Format(unsigned long v, std::wstring& t, std::wstring& s) {
    return Print(L"unsigned long", L"%ld", static_cast<long>(v), t, s);
  }
  static HRESULT Format(long long v, std::wstring& t, std::wstring& s) {
    return Print(L"long long", L"%lld", v, t, s);
  }
  static HRESULT Format(float v, std::wstring& t, std::wstring& s) {
    return Print(L"float", L"%f", static_cast<double>(v), t, s);
  }
  static HRESULT Format(double v, std::wstring& t, std::wstring& s) {
    return Print(L"double", L"%lf", v, t, s);
  }
  static HRESULT Format(IUnknown* v, std::wstring& t, std::wstring& s) {
    return Print(kInterfaceType, L"%llx",
                 static_cast<unsigned long long>(reinterpret_cast<uintptr_t>(v)), t, s);
  }
  // Any other arithmetic type is written as a double.
  template <class V>
  static HRESULT Format(V v, std::wstring& t, std::wstring& s) {
    return Print(L"double", L"%lf", static_cast<double>(v), t, s);
  }

  std::wstring type_;
  std::wstring text_;
};

// Kind of an entry in a bag.
enum NLEPropertyKind : int32_t {
  kNLEPropNone = 0,
  kNLEPropInt = 1,
  kNLEPropDouble = 2,
  kNLEPropString = 3,
  kNLEPropValue = 4,
  kNLEPropInterface = 5,
};

// Parameter types a parameter descriptor declares under kType.
enum enumNLEFilterPropertyType : int32_t {
  NLEFilterPropertyType_Int = 1,
  NLEFilterPropertyType_Bool = 2,
  NLEFilterPropertyType_Double = 3,
  NLEFilterPropertyType_String = 4,
};

// A bag of typed entries keyed by wide strings. Reading an entry with the wrong kind fails with
// NLE_E_TYPEMISMATCH, except that integers and doubles read as each other and a CNLEValue
// holding a number reads as an integer or a double. A missing key gives NLE_E_INVALIDARG.
// A bag is used by one thread at a time.
struct INLEProperties : IUnknown {
  virtual HRESULT SetInt(const wchar_t* key, int32_t value) = 0;
  virtual HRESULT GetInt(const wchar_t* key, int32_t* value) = 0;
  virtual HRESULT SetDouble(const wchar_t* key, double value) = 0;
  virtual HRESULT GetDouble(const wchar_t* key, double* value) = 0;
  virtual HRESULT SetString(const wchar_t* key, const wchar_t* value) = 0;
  // Copies the string into buf (at most capacity - 1 characters and a terminating zero; a longer
  // text is cut to fit). *length, when given, receives the full length.
  virtual HRESULT GetString(const wchar_t* key, wchar_t* buf, uint32_t capacity,
                            uint32_t* length) = 0;
  virtual HRESULT SetValue(const wchar_t* key, const CNLEValue& value) = 0;
  virtual HRESULT GetValue(const wchar_t* key, CNLEValue* value) = 0;
  // Stores an interface entry (the bag holds a reference).
  virtual HRESULT SetInterface(const wchar_t* key, IUnknown* value) = 0;
  // Reads an interface entry; *value receives a new reference.
  virtual HRESULT GetInterface(const wchar_t* key, IUnknown** value) = 0;
  virtual HRESULT Remove(const wchar_t* key) = 0;
  // Copies every entry into dst, overwriting entries with the same key. Interface entries are
  // shared (dst adds a reference), not deep-copied.
  virtual HRESULT CopyTo(INLEProperties* dst) = 0;
  virtual NLEPropertyKind GetKind(const wchar_t* key) = 0;
  // Keys in ascending order, for enumeration: the key of entry index (a pointer valid until the
  // bag is next changed), or null past the end.
  virtual uint32_t GetCount() = 0;
  virtual const wchar_t* GetKeyAt(uint32_t index) = 0;

 protected:
  ~INLEProperties() = default;
};

namespace NLEKey {
namespace Filter {
constexpr const wchar_t* kFilterID = L"Filter.ID";
constexpr const wchar_t* kFilterFriendName = L"Filter.FriendName";
constexpr const wchar_t* kFilterCSupport = L"Filter.CSupport";
constexpr const wchar_t* kFilterOpenclSupport = L"Filter.OpenCLSupport";
constexpr const wchar_t* kFilterType = L"Filter.Type";
// Integers a host may set on a filter's bag.
constexpr const wchar_t* kInnerROI = L"Filter.InnerROI";
constexpr const wchar_t* kIgnoreDef = L"Filter.IgnoreDef";

namespace Property {
constexpr const wchar_t* kCount = L"Filter.Property.Count";
constexpr const wchar_t* kVariantName = L"Property.VariantName";
constexpr const wchar_t* kFriendName = L"Property.FriendName";
constexpr const wchar_t* kDisplayType = L"Property.DisplayType";
constexpr const wchar_t* kType = L"Property.Type";
constexpr const wchar_t* kValue_Min = L"Property.Value.Min";
constexpr const wchar_t* kValue_Max = L"Property.Value.Max";
constexpr const wchar_t* kValue_Default = L"Property.Value.Default";
constexpr const wchar_t* kValue_Current = L"Property.Value.Current";

// Keys of the parameter descriptors of a filter, by parameter number.
constexpr int kMaxParams = 64;
inline constexpr const wchar_t* kParamsArray[kMaxParams] = {
    L"Filter.Param.0",  L"Filter.Param.1",  L"Filter.Param.2",  L"Filter.Param.3",
    L"Filter.Param.4",  L"Filter.Param.5",  L"Filter.Param.6",  L"Filter.Param.7",
    L"Filter.Param.8",  L"Filter.Param.9",  L"Filter.Param.10", L"Filter.Param.11",
    L"Filter.Param.12", L"Filter.Param.13", L"Filter.Param.14", L"Filter.Param.15",
    L"Filter.Param.16", L"Filter.Param.17", L"Filter.Param.18", L"Filter.Param.19",
    L"Filter.Param.20", L"Filter.Param.21", L"Filter.Param.22", L"Filter.Param.23",
    L"Filter.Param.24", L"Filter.Param.25", L"Filter.Param.26", L"Filter.Param.27",
    L"Filter.Param.28", L"Filter.Param.29", L"Filter.Param.30", L"Filter.Param.31",
    L"Filter.Param.32", L"Filter.Param.33", L"Filter.Param.34", L"Filter.Param.35",
    L"Filter.Param.36", L"Filter.Param.37", L"Filter.Param.38", L"Filter.Param.39",
    L"Filter.Param.40", L"Filter.Param.41", L"Filter.Param.42", L"Filter.Param.43",
    L"Filter.Param.44", L"Filter.Param.45", L"Filter.Param.46", L"Filter.Param.47",
    L"Filter.Param.48", L"Filter.Param.49", L"Filter.Param.50", L"Filter.Param.51",
    L"Filter.Param.52", L"Filter.Param.53", L"Filter.Param.54", L"Filter.Param.55",
    L"Filter.Param.56", L"Filter.Param.57", L"Filter.Param.58", L"Filter.Param.59",
    L"Filter.Param.60", L"Filter.Param.61", L"Filter.Param.62", L"Filter.Param.63",
};
}  // namespace Property
}  // namespace Filter
}  // namespace NLEKey
