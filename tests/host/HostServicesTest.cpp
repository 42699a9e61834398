#include <gtest/gtest.h>

#include <atomic>
#include <climits>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "host/host.h"

namespace {

TEST(CriticalSection, IsReentrantAndCopiesShareTheLock) {
  criticalSection cs;
  cs.enter();
  cs.enter();  // the same thread may enter again
  criticalSection copy(cs);
  EXPECT_TRUE(copy.sharesLockWith(cs));

  // Another thread cannot take the copy while this thread holds the original.
  std::atomic<bool> taken{false};
  std::thread other([&] {
    taken = copy.tryEnter();
    if (taken) copy.leave();
  });
  other.join();
  EXPECT_FALSE(taken.load());

  cs.leave();
  cs.leave();
  std::thread again([&] {
    taken = copy.tryEnter();
    if (taken) copy.leave();
  });
  again.join();
  EXPECT_TRUE(taken.load());

  criticalSection assigned;
  EXPECT_FALSE(assigned.sharesLockWith(cs));
  assigned = cs;
  EXPECT_TRUE(assigned.sharesLockWith(cs));
  assigned = assigned;  // self-assignment keeps the lock
  EXPECT_TRUE(assigned.sharesLockWith(cs));
}

TEST(CriticalSection, GuardsSharedStateAcrossThreads) {
  criticalSection cs;
  long counter = 0;
  auto work = [&, lock = cs] {
    for (int i = 0; i < 20000; ++i) {
      CriticalSectionLock hold(lock);
      ++counter;
    }
  };
  std::thread a(work), b(work);
  a.join();
  b.join();
  EXPECT_EQ(counter, 40000);
}

TEST(IdStamp, FreshStampsAreUniqueAndOrdered) {
  std::vector<IdStamp> stamps[2];
  auto make = [&](int t) {
    for (int i = 0; i < 5000; ++i) stamps[t].emplace_back();
  };
  std::thread a(make, 0), b(make, 1);
  a.join();
  b.join();
  std::set<IdStamp> all(stamps[0].begin(), stamps[0].end());
  all.insert(stamps[1].begin(), stamps[1].end());
  EXPECT_EQ(all.size(), 10000u);
  for (const IdStamp& s : all) EXPECT_TRUE(s.valid());

  IdStamp a1, a2;
  EXPECT_NE(a1, a2);
  EXPECT_EQ(a1.compare(a2), -a2.compare(a1));
  IdStamp copy = a1;
  EXPECT_EQ(copy, a1);
  copy.invalidate();
  EXPECT_FALSE(copy.valid());
  EXPECT_EQ(copy, IdStamp::invalidStamp());
}

TEST(Ptr, CountsUnderTwoThreadsAndFreesWithTheLastReference) {
  static std::atomic<int> alive{0};
  struct Tracked : iMemHolder {
    Tracked() { ++alive; }
    ~Tracked() override { --alive; }
    unsigned char* getBuffer() const noexcept override { return nullptr; }
    std::size_t getSize() const noexcept override { return 0; }
    std::size_t getUsed() const noexcept override { return 0; }
    void setUsed(std::size_t) noexcept override {}
  };
  {
    Kv::Ptr<iMemHolder> root(new Tracked);
    {
      auto churn = [root] {
        for (int i = 0; i < 20000; ++i) {
          Kv::Ptr<iMemHolder> copy(root);
          Kv::Ptr<iMemHolder> moved(std::move(copy));
          copy = moved;
        }
      };
      std::thread a(churn), b(churn);
      a.join();
      b.join();
    }
    EXPECT_EQ(root.useCount(), 1);
    EXPECT_EQ(alive.load(), 1);
  }
  EXPECT_EQ(alive.load(), 0);
}

TEST(Ptr, ByteBufferHolderIsZeroedAndTracksUse) {
  Kv::Ptr<iMemHolder> holder(new ByteBufferImpl(64));
  ASSERT_TRUE(holder);
  EXPECT_EQ(holder->getSize(), 64u);
  EXPECT_EQ(holder->getUsed(), 64u);
  for (std::size_t i = 0; i < 64; ++i) EXPECT_EQ(holder->getBuffer()[i], 0);
  holder->setUsed(10);
  EXPECT_EQ(holder->getUsed(), 10u);
  holder->setUsed(1000);  // never more than the block holds
  EXPECT_EQ(holder->getUsed(), 64u);
  Kv::Ptr<iMemHolder> empty;
  EXPECT_FALSE(empty);
  EXPECT_EQ(empty.useCount(), 0);
}

TEST(Strings, NarrowAndWideText) {
  String s("Mix");
  s += " Bus";
  String joined = s + String(" 1") + "!";
  EXPECT_STREQ(joined, "Mix Bus 1!");
  EXPECT_EQ(joined.size(), 10u);
  EXPECT_TRUE(String().isEmpty());
  EXPECT_TRUE(String("Version").compareCaseInsensitive("VERSION"));
  EXPECT_FALSE(String("Version").compareCaseInsensitive("Versions"));
  EXPECT_FALSE(String("a").compareCaseInsensitive(nullptr));
  EXPECT_STREQ(String(L"wide\u00e9"), "wide?");

  EXPECT_EQ(Kv::WStringFromAscii("48 kHz"), WString(L"48 kHz"));
  EXPECT_EQ(Kv::WStringFromInteger(0), WString(L"0"));
  EXPECT_EQ(Kv::WStringFromInteger(-42), WString(L"-42"));
  EXPECT_EQ(Kv::WStringFromInteger(INT_MIN), WString(L"-2147483648"));
  EXPECT_EQ(Kv::WStringFromInteger(INT_MAX), WString(L"2147483647"));
}

TEST(Resources, BuiltInTextsOverridesAndPadding) {
  for (int id : {56, 74, 2075, 2078, 2079, 2080, 2081, 2082, 2450, 2451, 2452}) {
    EXPECT_FALSE(resourceStrW(id, 0).empty()) << id;
    EXPECT_NE(resourceStrW(id, 0)[0], L'#') << id;
  }
  EXPECT_EQ(resourceStrW(999999, 0), WString(L"#999999"));
  host::setResourceText(999998, L"Custom");
  EXPECT_EQ(resourceStrW(999998, 0), WString(L"Custom"));
  EXPECT_EQ(paddedResourceStrW(999998, L"< ", L" >"), WString(L"< Custom >"));
  EXPECT_EQ(resourceStrW(999998, ResStrFmt_Upper), WString(L"CUSTOM"));
}

TEST(Diagnostics, FatalReportsAndLogLinesReachTheHooks) {
  std::vector<std::string> reports, lines;
  host::setFatalReportHandler([&](const char* m) { reports.emplace_back(m); });
  host::setLogSink([&](const char* t) { lines.emplace_back(t); });
  vel_splat("broken invariant");
  LogBoth("value %d", 7);
  tarn_printf("%s", "console");
  host::setFatalReportHandler({});
  vel_splat("to the sink");  // the default writes the report to the log sink
  host::setLogSink({});
  ASSERT_EQ(reports.size(), 1u);
  EXPECT_EQ(reports[0], "broken invariant");
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_EQ(lines[0], "value 7\n");
  EXPECT_EQ(lines[1], "console");
  EXPECT_NE(lines[2].find("to the sink"), std::string::npos);
}

TEST(Configuration, ConfigAndTypedPreferences) {
  host::clearConfig();
  EXPECT_EQ(config_int("video_in_film_pulldown", 5), 5);
  host::setConfigInt("video_in_film_pulldown", 1);
  EXPECT_EQ(config_int("video_in_film_pulldown", 5), 1);
  host::clearConfig();
  EXPECT_EQ(config_int("video_in_film_pulldown", 5), 5);

  host::resetPreferences();
  EXPECT_EQ(prefs().getPreference("Key", 3), 3);
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

TEST(NamedObjects, OneObjectPerNameMadeOnceAcrossThreads) {
  auto& ns = Kv::NamedObjectsNamespace::getGlobalNamespaceInstance();
  Counter* seen[4] = {};
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i)
    threads.emplace_back([&, i] { seen[i] = ns.findOrCreate<Counter>("host-test"); });
  for (auto& t : threads) t.join();
  EXPECT_EQ(Counter::made.load(), 1);
  for (Counter* c : seen) EXPECT_EQ(c, seen[0]);
  EXPECT_NE(ns.findOrCreate<Counter>("another"), seen[0]);

  host::setNamedObjectsAvailable(false);
  EXPECT_EQ(ns.findOrCreate<Counter>("host-test"), nullptr);
  host::setNamedObjectsAvailable(true);
  EXPECT_EQ(ns.findOrCreate<Counter>("host-test"), seen[0]);
}

TEST(ProjectTime, FrameDurationClockAndGearing) {
  EXPECT_DOUBLE_EQ(Kv::CurrentProject::getFrameDuration(), 1.0 / 25.0);
  host::setFrameDuration(1001.0 / 30000.0);
  EXPECT_DOUBLE_EQ(Kv::CurrentProject::getFrameDuration(), 1001.0 / 30000.0);
  host::setFrameDuration(1.0 / 25.0);

  EXPECT_EQ(mPosn_Xlate_CelToClock(12.5, Kv::OutputGearing{}), 12.5);
  EXPECT_EQ(mPosn_Xlate_CelToClock(10.0, Kv::OutputGearing{2.0, 1.0}), 21.0);

  host::setClock([] { return 1234.5; });
  EXPECT_EQ(service_get_msecs_precise(), 1234.5);
  host::setClock({});
  const double a = service_get_msecs_precise();
  EXPECT_GE(service_get_msecs_precise(), a);

  EXPECT_TRUE(valLessThanVal(1.0, 2.0));
  EXPECT_FALSE(valLessThanVal(2.0, 2.0));
}

TEST(Exceptions, CarryTypeMessageFileAndLine) {
  try {
    throw Kv::Exception::RuntimeError("bad thing", "Aud__Here", 37);
  } catch (const Kv::Exception::Base& e) {
    EXPECT_STREQ(e.getTypeName(), "RuntimeError");
    EXPECT_STREQ(e.getMessage(), "bad thing");
    EXPECT_STREQ(e.getFile(), "Aud__Here");
    EXPECT_EQ(e.getLine(), 37);
  }
  Kv::Exception::LogicError logic("x", "f", 1);
  EXPECT_STREQ(logic.getTypeName(), "LogicError");
}

TEST(Allocator, StdAllocatorContainersUseTheHostHeap) {
  std::vector<int, StdAllocator<int>> v;
  for (int i = 0; i < 1000; ++i) v.push_back(i);
  EXPECT_EQ(v[999], 999);
  StdAllocator<double> a;
  EXPECT_THROW((void)a.allocate(std::size_t(-1) / 4), std::bad_alloc);
}

}  // namespace
