#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <climits>
#include <functional>
#include <future>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "host/host.h"

namespace {

void onThreads(int n, const std::function<void(int)>& f) {
  std::vector<std::thread> threads;
  for (int i = 0; i < n; ++i) threads.emplace_back(f, i);
  for (auto& t : threads) t.join();
}
bool tryFromAnotherThread(criticalSection& cs) {
  return std::async(std::launch::async, [&] { return cs.tryEnter() && (cs.leave(), true); }).get();
}

TEST(CriticalSection, IsReentrantCopiesShareTheLockAndGuardsAcrossThreads) {
  criticalSection cs;
  cs.enter();
  cs.enter();  // the same thread may enter again
  criticalSection copy(cs);
  EXPECT_TRUE(copy.sharesLockWith(cs));
  EXPECT_FALSE(tryFromAnotherThread(copy));
  cs.leave();
  cs.leave();
  EXPECT_TRUE(tryFromAnotherThread(copy));

  criticalSection assigned;
  EXPECT_FALSE(assigned.sharesLockWith(cs));
  assigned = cs;
  assigned = assigned;  // self-assignment keeps the lock
  EXPECT_TRUE(assigned.sharesLockWith(cs));

  long counter = 0;
  onThreads(2, [&, lock = cs](int) {
    for (int i = 0; i < 20000; ++i) {
      CriticalSectionLock hold(lock);
      ++counter;
    }
  });
  EXPECT_EQ(counter, 40000);
}

TEST(IdStamp, FreshStampsAreUniqueAcrossThreads) {
  std::vector<IdStamp> stamps[2];
  onThreads(2, [&](int t) {
    for (int i = 0; i < 5000; ++i) stamps[t].emplace_back();
  });
  std::set<IdStamp> all(stamps[0].begin(), stamps[0].end());
  all.insert(stamps[1].begin(), stamps[1].end());
  EXPECT_EQ(all.size(), 10000u);
  EXPECT_TRUE(std::all_of(all.begin(), all.end(), [](const IdStamp& s) { return s.valid(); }));
  IdStamp s1, s2;
  EXPECT_EQ(s1.compare(s2), -s2.compare(s1));
  s1.invalidate();
  EXPECT_EQ(s1, IdStamp::invalidStamp());
}

TEST(Ptr, CountsUnderTwoThreadsAndFreesWithTheLastReference) {
  static std::atomic<int> alive{0};
  struct Tracked : ByteBufferImpl {
    Tracked() : ByteBufferImpl(1) { ++alive; }
    ~Tracked() override { --alive; }
  };
  {
    Kv::Ptr<iMemHolder> root(new Tracked);
    onThreads(2, [root](int) {
      for (int i = 0; i < 20000; ++i) {
        Kv::Ptr<iMemHolder> copy(root);
        Kv::Ptr<iMemHolder> moved(std::move(copy));
        copy = moved;
      }
    });
    EXPECT_EQ(root.useCount(), 1);
    EXPECT_EQ(alive.load(), 1);
  }
  EXPECT_EQ(alive.load(), 0);

  Kv::Ptr<iMemHolder> holder(new ByteBufferImpl(64));
  EXPECT_TRUE(std::all_of(holder->getBuffer(), holder->getBuffer() + 64, [](auto b) { return b == 0; }));
  holder->setUsed(10);
  EXPECT_EQ(holder->getUsed(), 10u);
  holder->setUsed(1000);  // never more than the block holds
  EXPECT_EQ(holder->getUsed(), 64u);
}

TEST(Strings, TextsResourcesExceptionsAndTheAllocator) {
  EXPECT_STREQ((String("Mix") += " Bus") + String(" 1") + "!", "Mix Bus 1!");
  EXPECT_TRUE(String().isEmpty() && String("Version").compareCaseInsensitive("VERSION"));
  EXPECT_FALSE(String("Version").compareCaseInsensitive("Versions") ||
               String("a").compareCaseInsensitive(nullptr));
  EXPECT_STREQ(String(L"wide\u00e9"), "wide?");
  EXPECT_EQ(Kv::WStringFromAscii("48 kHz"), WString(L"48 kHz"));
  for (auto [n, text] :
       {std::pair{0, L"0"}, {-42, L"-42"}, {INT_MIN, L"-2147483648"}, {INT_MAX, L"2147483647"}})
    EXPECT_EQ(Kv::WStringFromInteger(n), WString(text));

  for (int id : {56, 74, 2075, 2078, 2079, 2080, 2081, 2082, 2450, 2451, 2452})
    EXPECT_EQ(resourceStrW(id, 0).find_first_not_of(L'#'), 0u) << id;  // present, not a placeholder
  EXPECT_EQ(resourceStrW(999999, 0), WString(L"#999999"));
  host::setResourceText(999998, L"Custom");
  EXPECT_EQ(paddedResourceStrW(999998, L"< ", L" >"), WString(L"< Custom >"));
  EXPECT_EQ(resourceStrW(999998, ResStrFmt_Upper), WString(L"CUSTOM"));

  const Kv::Exception::Base& base = Kv::Exception::RuntimeError("bad thing", "Aud__Here", 37);
  EXPECT_STREQ(base.getTypeName(), "RuntimeError");
  EXPECT_STREQ(base.getMessage(), "bad thing");
  EXPECT_STREQ(base.getFile(), "Aud__Here");
  EXPECT_EQ(base.getLine(), 37);
  EXPECT_STREQ(Kv::Exception::LogicError("x", "f", 1).getTypeName(), "LogicError");
  EXPECT_THROW((void)StdAllocator<double>().allocate(std::size_t(-1) / 4), std::bad_alloc);
}

TEST(Hooks, FatalReportsLogLinesConfigAndPreferences) {
  std::vector<std::string> reports, lines;
  host::setFatalReportHandler([&](const char* m) { reports.emplace_back(m); });
  host::setLogSink([&](const char* t) { lines.emplace_back(t); });
  vel_splat("broken invariant");
  LogBoth("value %d", 7);
  tarn_printf("%s", "console");
  host::setFatalReportHandler({});
  vel_splat("to the sink");  // the default writes the report to the log sink
  host::setLogSink({});
  EXPECT_EQ(reports, std::vector<std::string>{"broken invariant"});
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_EQ(lines[0], "value 7\n");
  EXPECT_EQ(lines[1], "console");
  EXPECT_NE(lines[2].find("to the sink"), std::string::npos);

  host::setConfigInt("video_in_film_pulldown", 1);
  EXPECT_EQ(config_int("video_in_film_pulldown", 5), 1);
  host::clearConfig();
  EXPECT_EQ(config_int("video_in_film_pulldown", 5), 5);

  host::resetPreferences();
  prefs().setPreference("Key", 9);
  EXPECT_EQ(prefs().getPreference("Key", 3), 9);
  EXPECT_EQ(prefs().getPreference("Key", 1.5), 1.5);  // stored as int: a double read gets the default
  prefs().setPreference("Level", -18.0);
  EXPECT_EQ(prefs().getPreference("Level", 0.0), -18.0);
  prefs().setPreference("On", false);
  EXPECT_FALSE(prefs().getPreference("On", true));
  host::resetPreferences();
  EXPECT_TRUE(prefs().getPreference("On", true));
}

struct Counter : iObject {
  static inline std::atomic<int> made{0};
  Counter() { ++made; }
};

TEST(Hooks, NamedObjectsFrameDurationAndClock) {
  auto& ns = Kv::NamedObjectsNamespace::getGlobalNamespaceInstance();
  Counter* seen[4] = {};
  onThreads(4, [&](int i) { seen[i] = ns.findOrCreate<Counter>("host-test"); });
  EXPECT_EQ(Counter::made.load(), 1);
  for (Counter* c : seen) EXPECT_EQ(c, seen[0]);
  EXPECT_NE(ns.findOrCreate<Counter>("another"), seen[0]);
  host::setNamedObjectsAvailable(false);
  EXPECT_EQ(ns.findOrCreate<Counter>("host-test"), nullptr);
  host::setNamedObjectsAvailable(true);
  EXPECT_EQ(ns.findOrCreate<Counter>("host-test"), seen[0]);

  EXPECT_DOUBLE_EQ(Kv::CurrentProject::getFrameDuration(), 1.0 / 25.0);
  host::setFrameDuration(1001.0 / 30000.0);
  EXPECT_DOUBLE_EQ(Kv::CurrentProject::getFrameDuration(), 1001.0 / 30000.0);
  host::setFrameDuration(1.0 / 25.0);
  EXPECT_EQ(mPosn_Xlate_CelToClock(12.5, Kv::OutputGearing{}), 12.5);
  EXPECT_EQ(mPosn_Xlate_CelToClock(10.0, Kv::OutputGearing{2.0, 1.0}), 21.0);
  host::setClock([] { return 1234.5; });
  EXPECT_EQ(service_get_msecs_precise(), 1234.5);
  host::setClock({});
  const double t = service_get_msecs_precise();
  EXPECT_GE(service_get_msecs_precise(), t);
  EXPECT_TRUE(valLessThanVal(1.0, 2.0) && !valLessThanVal(2.0, 2.0));
}

}  // namespace
