#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

#include "support/ScopedVariable.h"
#include "tessarofx/NLEHost.h"

namespace {

NLEComPtr<INLEEnviroment> GetEnvironment() {
  NLEComPtr<INLEEnviroment> env;
  EXPECT_EQ(NLECommon::GetInterface(CLSID_NLEEnviroment, nullptr, 0, IID_INLEEnviroment,
                                    reinterpret_cast<void**>(&env)),
            NLE_S_OK);
  return env;
}

std::wstring Translate(INLEEnviroment* env, const wchar_t* path) {
  wchar_t out[256];
  return NLE_SUCCEEDED(env->TranslatePath(path, out, 256, nullptr)) ? out : L"<failed>";
}

TEST(Environment, ExpandsHomeAndVariables) {
  ScopedVariable home("HOME", "/home/tester");
  ScopedVariable a("TFXTEST_A", "alpha");
  ScopedVariable unset("TFXTEST_UNSET", nullptr);
  ScopedVariable longer("TFXTEST_Ax", nullptr);
  ScopedVariable utf8("TFXTEST_UTF8", "caf\xC3\xA9\xFF");
  auto env = GetEnvironment();
  const struct {
    const wchar_t* in;
    const wchar_t* out;
  } cases[] = {
      {L"/abs/path.cube", L"/abs/path.cube"},
      {L"", L""},
      {L"~", L"/home/tester"},
      {L"~/luts/a.cube", L"/home/tester/luts/a.cube"},
      {L"~user/a", L"~user/a"},
      {L"a/~/b", L"a/~/b"},
      {L"$TFXTEST_A/x", L"alpha/x"},
      {L"${TFXTEST_A}x", L"alphax"},
      {L"$TFXTEST_Ax", L""},  // the name runs as far as name characters go
      {L"$TFXTEST_UNSET/x", L"/x"},
      {L"${TFXTEST_A}${TFXTEST_A}", L"alphaalpha"},
      {L"$$TFXTEST_A", L"$TFXTEST_A"},
      {L"cost$", L"cost$"},
      {L"$/x", L"$/x"},
      {L"${TFXTEST_A", L"${TFXTEST_A"},
      {L"${}", L"${}"},
      {L"${TFX-A}", L"${TFX-A}"},
      {L"$TFXTEST_UTF8", L"caf\u00E9\uFFFD"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.in);
    EXPECT_EQ(Translate(env, c.in), c.out);
  }
}

TEST(Environment, ReportsNeededLengthWhenBufferIsShort) {
  ScopedVariable a("TFXTEST_A", "alpha");
  auto env = GetEnvironment();
  wchar_t out[8] = L"junk";
  uint32_t needed = 0;
  EXPECT_EQ(env->TranslatePath(L"$TFXTEST_A/xy", out, 8, &needed), NLE_E_OUTOFMEMORY);
  EXPECT_EQ(needed, 8u);
  EXPECT_STREQ(out, L"") << "a cut path is never handed out";
  EXPECT_EQ(env->TranslatePath(L"$TFXTEST_A/xy", nullptr, 0, &needed), NLE_E_OUTOFMEMORY);
  EXPECT_EQ(needed, 8u);
  wchar_t exact[9];
  EXPECT_EQ(env->TranslatePath(L"$TFXTEST_A/xy", exact, 9, &needed), NLE_S_OK);
  EXPECT_STREQ(exact, L"alpha/xy");
  EXPECT_EQ(env->TranslatePath(nullptr, exact, 9, &needed), NLE_E_INVALIDARG);
  EXPECT_EQ(env->TranslatePath(L"a", nullptr, 9, &needed), NLE_E_POINTER);
  EXPECT_EQ(GetEnvironment().get(), env.get()) << "one shared instance";
}

}  // namespace
