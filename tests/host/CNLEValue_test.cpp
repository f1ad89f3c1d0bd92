#include <gtest/gtest.h>

#include <string>

#include "host/CountedObject.h"
#include "tessarofx/NLEProperties.h"

namespace {

TEST(CNLEValue, ComparesTypeNameAndTextAsFormatted) {
  const CNLEValue one(1.0);
  EXPECT_EQ(one.TypeName(), L"double");
  EXPECT_EQ(one.Text(), L"1.000000");
  EXPECT_NE(CNLEValue(1), one);
  EXPECT_EQ(CNLEValue(1.0000001), one) << "doubles compare at six decimals";
  EXPECT_NE(CNLEValue(1.000001), one);
  EXPECT_EQ(CNLEValue(true).TypeName(), L"double") << "types without a name of their own";

  std::wstring type, text;
  unsigned long big = 1ul << 63;
  EXPECT_EQ(CNLEValue::T2String<unsigned long>(big, type, text), NLE_S_OK);
  EXPECT_EQ(type, L"unsigned long");
  EXPECT_EQ(text, L"-9223372036854775808") << "the signed format is kept";
}

TEST(CNLEValue, InterfaceValueHoldsAReferenceUntilReplacedOrDestroyed) {
  CountedObject obj;
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

}  // namespace
