// Reads and writes the layout of a filter descriptor bag: parameters hang under
// kParamsArray[i] with kCount giving how many.
#pragma once

#include "base/Assert.h"
#include "tessarofx/NLEProperties.h"

class NLEFilterInfoComPtr {
 public:
  NLEFilterInfoComPtr() = default;
  explicit NLEFilterInfoComPtr(INLEProperties* p) : p_(p) {}
  explicit NLEFilterInfoComPtr(const NLEComPtr<INLEProperties>& p) : p_(p) {}

  // A null descriptor here is a programming error, never a runtime condition.
  INLEProperties* operator->() const {
    INLEProperties* p = p_.get();
    TFX_ASSERT(p != NULL);
    return p;
  }
  INLEProperties* get() const { return p_.get(); }

  // Appends a parameter descriptor. The step is converted like the other values but hosts get
  // no step key. Always returns 0.
  template <class T>
  int AddParam(const wchar_t* name, enumNLEFilterPropertyType type, T def, T min, T max, T step,
               const wchar_t* friendName, int displayType);

  // Parameter descriptor i, or null when there is none.
  NLEComPtr<INLEProperties> GetParam(int i) const;

 private:
  NLEComPtr<INLEProperties> p_;
};

extern template int NLEFilterInfoComPtr::AddParam<double>(const wchar_t*, enumNLEFilterPropertyType,
                                                          double, double, double, double,
                                                          const wchar_t*, int);
extern template int NLEFilterInfoComPtr::AddParam<int>(const wchar_t*, enumNLEFilterPropertyType,
                                                       int, int, int, int, const wchar_t*, int);
