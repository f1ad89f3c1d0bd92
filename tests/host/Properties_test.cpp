#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "host/CountedObject.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/NLEProperties.h"

namespace {

NLEComPtr<INLEProperties> NewBag() {
  NLEComPtr<INLEProperties> bag;
  EXPECT_EQ(NLECommon::CreateProperties(&bag), NLE_S_OK);
  return bag;
}

TEST(Properties, ReadsNumbersAcrossIntDoubleAndValueEntries) {
  auto bag = NewBag();
  bag->SetInt(L"i", -7);
  bag->SetDouble(L"d", -2.9);
  bag->SetDouble(L"big", 3e9);
  bag->SetDouble(L"nan", std::nan(""));
  bag->SetValue(L"vi", CNLEValue(12));
  bag->SetValue(L"vd", CNLEValue(1.5));
  bag->SetValue(L"vs", CNLEValue::FromParts(L"string", L"12abc"));

  double d = 0;
  int32_t i = 0;
  EXPECT_EQ(bag->GetDouble(L"i", &d), NLE_S_OK);
  EXPECT_EQ(d, -7.0);
  EXPECT_EQ(bag->GetInt(L"d", &i), NLE_S_OK);
  EXPECT_EQ(i, -2) << "doubles truncate toward zero";
  EXPECT_EQ(bag->GetInt(L"vi", &i), NLE_S_OK);
  EXPECT_EQ(i, 12);
  EXPECT_EQ(bag->GetInt(L"vd", &i), NLE_S_OK);
  EXPECT_EQ(i, 1);
  EXPECT_EQ(bag->GetDouble(L"vd", &d), NLE_S_OK);
  EXPECT_EQ(d, 1.5);
  // No integer reading: out of range, NaN, or a value whose text is not a whole number.
  EXPECT_EQ(bag->GetInt(L"big", &i), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(bag->GetInt(L"nan", &i), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(bag->GetInt(L"vs", &i), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(bag->GetDouble(L"vs", &d), NLE_E_TYPEMISMATCH);
}

TEST(Properties, RejectsWrongKindsMissingKeysAndNullPointers) {
  CountedObject obj;  // outlives the bag that refers to it
  auto bag = NewBag();
  bag->SetString(L"s", L"text");
  bag->SetInt(L"i", 1);
  bag->SetInterface(L"p", &obj);
  int32_t i = 0;
  double d = 0;
  wchar_t buf[8];
  CNLEValue v;
  IUnknown* p = &obj;
  EXPECT_EQ(bag->GetInt(L"s", &i), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(bag->GetDouble(L"p", &d), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(bag->GetString(L"i", buf, 8, nullptr), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(buf[0], L'\0');
  EXPECT_EQ(bag->GetValue(L"i", &v), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(bag->GetInterface(L"s", &p), NLE_E_TYPEMISMATCH);
  EXPECT_EQ(p, nullptr);
  EXPECT_EQ(bag->GetInt(L"absent", &i), NLE_E_INVALIDARG);
  EXPECT_EQ(bag->Remove(L"absent"), NLE_E_INVALIDARG);
  EXPECT_EQ(bag->SetInt(nullptr, 1), NLE_E_INVALIDARG);
  EXPECT_EQ(bag->GetInt(nullptr, &i), NLE_E_INVALIDARG);
  EXPECT_EQ(bag->GetInt(L"i", nullptr), NLE_E_POINTER);
  EXPECT_EQ(bag->SetString(L"s", nullptr), NLE_E_POINTER);
  EXPECT_EQ(bag->SetInterface(L"p", nullptr), NLE_E_POINTER);
  EXPECT_EQ(bag->CopyTo(nullptr), NLE_E_POINTER);
  EXPECT_EQ(bag->GetKind(nullptr), kNLEPropNone);

  // Setting a key again replaces the entry whatever its kind was.
  bag->SetDouble(L"s", 2.0);
  EXPECT_EQ(bag->GetKind(L"s"), kNLEPropDouble);
}

TEST(Properties, CutsLongStringsToCapacityAndReportsFullLength) {
  auto bag = NewBag();
  bag->SetString(L"s", L"abcdef");
  wchar_t buf[8];
  uint32_t length = 0;
  EXPECT_EQ(bag->GetString(L"s", buf, 4, &length), NLE_S_OK);
  EXPECT_STREQ(buf, L"abc");
  EXPECT_EQ(length, 6u);
  EXPECT_EQ(bag->GetString(L"s", buf, 7, nullptr), NLE_S_OK);
  EXPECT_STREQ(buf, L"abcdef");
  EXPECT_EQ(bag->GetString(L"s", buf, 1, nullptr), NLE_S_OK);
  EXPECT_STREQ(buf, L"");
  // A null buffer of capacity 0 asks for the length only; a zero capacity never writes.
  length = 0;
  EXPECT_EQ(bag->GetString(L"s", nullptr, 0, &length), NLE_S_OK);
  EXPECT_EQ(length, 6u);
  buf[0] = L'x';
  EXPECT_EQ(bag->GetString(L"s", buf, 0, nullptr), NLE_S_OK);
  EXPECT_EQ(buf[0], L'x');
  EXPECT_EQ(bag->GetString(L"s", nullptr, 4, &length), NLE_E_POINTER);
}

// Copies of strings and values are the filters' business (their settings arrive through CopyTo).
TEST(Properties, HoldsOneReferencePerInterfaceEntryAndCopiesShareThem) {
  CountedObject obj;
  {
    auto bag = NewBag();
    bag->SetInterface(L"p", &obj);
    EXPECT_EQ(obj.refs, 1u);
    IUnknown* got = nullptr;
    EXPECT_EQ(bag->GetInterface(L"p", &got), NLE_S_OK);
    EXPECT_EQ(got, &obj);
    EXPECT_EQ(obj.refs, 2u);
    got->Release();
    bag->SetInt(L"p", 1);  // overwriting releases
    EXPECT_EQ(obj.refs, 0u);
    bag->SetInterface(L"p", &obj);
    EXPECT_EQ(bag->Remove(L"p"), NLE_S_OK);
    EXPECT_EQ(obj.refs, 0u);
    EXPECT_EQ(bag->GetKind(L"p"), kNLEPropNone);
    // An interface inside a CNLEValue is counted by the stored copy too.
    bag->SetValue(L"v", CNLEValue(static_cast<IUnknown*>(&obj)));
    EXPECT_EQ(obj.refs, 1u);
    bag->SetInterface(L"q", &obj);
    EXPECT_EQ(obj.refs, 2u);
  }
  EXPECT_EQ(obj.refs, 0u) << "a destroyed bag releases what it holds";
  {
    // A copy overwrites the same keys, keeps the others and shares the interfaces.
    auto src = NewBag();
    auto dst = NewBag();
    src->SetInt(L"a", 1);
    src->SetInterface(L"d", &obj);
    dst->SetString(L"a", L"old");
    dst->SetInt(L"z", 9);
    EXPECT_EQ(src->CopyTo(dst), NLE_S_OK);
    EXPECT_EQ(obj.refs, 2u);
    int32_t a = 0, z = 0;
    EXPECT_EQ(dst->GetInt(L"a", &a), NLE_S_OK);
    EXPECT_EQ(a, 1);
    EXPECT_EQ(dst->GetInt(L"z", &z), NLE_S_OK);
    EXPECT_EQ(z, 9);
    EXPECT_EQ(src->CopyTo(src), NLE_S_OK);
    EXPECT_EQ(src->GetCount(), 2u);
  }
  EXPECT_EQ(obj.refs, 0u);
  {
    CNLEValue v(static_cast<IUnknown*>(&obj));
    EXPECT_TRUE(v.IsInterface());
    EXPECT_EQ(v.GetInterface(), &obj);
    EXPECT_EQ(obj.refs, 1u);
    CNLEValue copy = v;
    EXPECT_EQ(obj.refs, 2u);
    copy.Set(5);
    EXPECT_EQ(obj.refs, 1u);
    copy = v;
    EXPECT_EQ(obj.refs, 2u);
  }
  EXPECT_EQ(obj.refs, 0u);
}

TEST(Properties, EnumeratesKeysInAscendingOrder) {
  auto bag = NewBag();
  for (const wchar_t* key : {L"b", L"a", L"c"}) bag->SetInt(key, 1);
  bag->Remove(L"a");
  bag->SetInt(L"0", 1);
  ASSERT_EQ(bag->GetCount(), 3u);
  EXPECT_STREQ(bag->GetKeyAt(0), L"0");
  EXPECT_STREQ(bag->GetKeyAt(1), L"b");
  EXPECT_STREQ(bag->GetKeyAt(2), L"c");
  EXPECT_EQ(bag->GetKeyAt(3), nullptr);
}

TEST(CNLEValue, ComparesTypeNameAndTextAsFormatted) {
  // Type names and texts, and an int against a double, are the filter tests' business.
  const CNLEValue one(1.0);
  EXPECT_EQ(CNLEValue(1.0000001), one) << "doubles compare at six decimals";
  EXPECT_NE(CNLEValue(1.000001), one);
  EXPECT_EQ(CNLEValue(true).TypeName(), L"double") << "types without a name of their own";

  std::wstring type, text;
  unsigned long big = 1ul << 63;
  EXPECT_EQ(CNLEValue::T2String<unsigned long>(big, type, text), NLE_S_OK);
  EXPECT_EQ(type, L"unsigned long");
  EXPECT_EQ(text, L"-9223372036854775808") << "the signed format is kept";
}

}  // namespace
