#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"

namespace {

// Each test gets the logger at its default level with the default sink back afterwards.
class Logger : public testing::Test {
 protected:
  void TearDown() override {
    log_->SetLevel(saved_);
    log_->SetSink(nullptr, nullptr);
  }
  INLELogger* log_ = NLEGetDefaultLogger();
  int32_t saved_ = log_->GetLevel();
};

TEST_F(Logger, FormatsMessagesAtOrAboveTheLevelAndDropsTheRest) {
  tfx_test::LogCapture got(kNLELogWarning);
  EXPECT_FALSE(log_->IsLevelEnabled(kNLELogInfo));
  EXPECT_TRUE(log_->IsLevelEnabled(kNLELogWarning));
  log_->Log(kNLELogInfo, L"dropped");
  log_->Log(kNLELogWarning, L"CREATE <PureC> Filter: %ls  [%ls, %d]", L"Vignette",
            L"F0F0F0F0-0000-0000-0000-000000000000", 1);
  const std::wstring longText(5000, L'x');
  log_->Log(kNLELogError, L"<%ls>", longText.c_str());
  log_->SetLevel(kNLELogOff);
  log_->Log(kNLELogError, L"silenced");
  log_->Log(kNLELogOff, L"silenced too");
  const decltype(got.lines) expected = {
      {kNLELogWarning,
       L"CREATE <PureC> Filter: Vignette  [F0F0F0F0-0000-0000-0000-000000000000, 1]"},
      {kNLELogError, L"<" + longText + L">"}};
  EXPECT_EQ(got.lines, expected);
}

TEST_F(Logger, DefaultSinkWritesTaggedUtf8LinesToStderr) {
  log_->SetLevel(kNLELogTrace);
  testing::internal::CaptureStderr();
  log_->Log(kNLELogWarning, L"caf\u00E9 %d", 7);
  log_->Log(40, L"between");
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "[warning] caf\xC3\xA9 7\n[40] between\n");
}

TEST_F(Logger, HandsOneMessageAtATimeToTheSink) {
  struct Probe {
    std::atomic<bool> inside{false};
    std::atomic<int> overlaps{0};
    int calls = 0;
  } probe;
  log_->SetSink(
      [](void* context, int32_t, const wchar_t*) {
        auto* p = static_cast<Probe*>(context);
        if (p->inside.exchange(true)) ++p->overlaps;
        ++p->calls;
        p->inside = false;
      },
      &probe);
  log_->SetLevel(kNLELogInfo);
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([this] {
      for (int i = 0; i < 2000; ++i) log_->Log(kNLELogInfo, L"%d", i);
    });
  }
  for (auto& t : threads) t.join();
  EXPECT_EQ(probe.overlaps, 0);
  EXPECT_EQ(probe.calls, 8000);
}

// The level is read from the environment once, when the logger is first used, so each case
// runs in a fresh process.
TEST(LoggerDeathTest, TakesItsLevelFromTheEnvironment) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  const std::pair<const char*, int32_t> cases[] = {
      {"off", kNLELogOff}, {"OFF", kNLELogOff}, {"16", 16}, {"junk", 32}, {"", 32}};
  for (const auto& [text, level] : cases) {
    SCOPED_TRACE(text);
    EXPECT_EXIT(
        {
          setenv("TESSAROFX_LOG_LEVEL", text, 1);
          std::exit(NLEGetDefaultLogger()->GetLevel() == level ? 0 : 1);
        },
        testing::ExitedWithCode(0), "");
  }
}

}  // namespace
