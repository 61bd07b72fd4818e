// SPDX-License-Identifier: Apache-2.0
//
// Objects that live on a queue of their own: who keeps them alive, where and when they end.
#include "Helper/Platform/vlu/SharedSynchronizable.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <memory>
#include <new>
#include <semaphore>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace {

/// Makes the next allocation of this thread fail.
thread_local bool nextAllocationFails = false;

}  // namespace

// The test's own, in the whole program: there is no other way to run out of memory at will. Not
// inlined, or the compiler takes free() for the wrong partner of new.
[[gnu::noinline]] void* operator new(std::size_t size) {
  if (std::exchange(nextAllocationFails, false)) throw std::bad_alloc();
  if (void* memory = std::malloc(size)) return memory;
  throw std::bad_alloc();
}
[[gnu::noinline]] void operator delete(void* memory) noexcept { std::free(memory); }
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept { std::free(memory); }

namespace {

using namespace std::string_literals;

/// What an object did, as the test sees it when the object is gone.
struct Record {
  std::vector<std::string> events;
  bool endedOnItsQueue = false;
  bool postingInTheEndFailed = false;
  std::binary_semaphore ended{0};
};

class Subject : public vlu::SharedSynchronizable<Subject> {
 public:
  explicit Subject(Record& record) : SharedSynchronizable("test.subject"), record_(record) {}
  ~Subject() {
    record_.events.push_back("end");
    record_.endedOnItsQueue = queue().isCurrent();
    try {
      post([] {});
    } catch (const std::bad_weak_ptr&) {
      record_.postingInTheEndFailed = true;
    }
    record_.ended.release();
  }
  void note(const std::string& event) { record_.events.push_back(event); }

 private:
  Record& record_;
};

class SharedSynchronizable : public testing::Test {
 protected:
  Record record;
  std::binary_semaphore gate{0};
};

TEST_F(SharedSynchronizable, RunsWhatIsPostedOnItsQueueInOrder) {
  auto subject = Subject::make_shared_ptr(new Subject(record));
  EXPECT_EQ(subject->queue().label(), "test.subject");
  std::binary_semaphore done(0);
  bool onQueue = false;
  subject->post([&] { subject->note("first"); });
  subject->post([&] {
    subject->note("second");
    onQueue = subject->queue().isCurrent();
    done.release();
  });
  done.acquire();
  EXPECT_TRUE(onQueue);
  EXPECT_EQ(record.events, (std::vector{"first"s, "second"s}));
  subject.reset();
  record.ended.acquire();  // it writes there at its end
}

TEST_F(SharedSynchronizable, EndsOnItsQueueAfterAllThatWasPosted) {
  auto subject = Subject::make_shared_ptr(new Subject(record));
  Subject* object = subject.get();
  subject->post([&] { gate.acquire(); });
  for (const char* event : {"first", "second"}) {
    subject->post([object, event] { object->note(event); });
  }
  subject.reset();
  EXPECT_TRUE(record.events.empty()) << "the work waits, and so does the end";
  gate.release();
  record.ended.acquire();
  EXPECT_EQ(record.events, (std::vector{"first"s, "second"s, "end"s}));
  EXPECT_TRUE(record.endedOnItsQueue);
}

TEST_F(SharedSynchronizable, EndsOnItsQueueWithoutAnyWork) {
  Subject::make_shared_ptr(new Subject(record)).reset();
  record.ended.acquire();
  EXPECT_TRUE(record.endedOnItsQueue);
}

TEST_F(SharedSynchronizable, LivesAsLongAsWorkThatItPostedToItself) {
  auto subject = Subject::make_shared_ptr(new Subject(record));
  Subject* object = subject.get();
  subject->post([&] {
    gate.acquire();
    object->note("outer");
    object->post([object] { object->note("inner"); });
  });
  subject.reset();
  gate.release();
  record.ended.acquire();
  EXPECT_EQ(record.events, (std::vector{"outer"s, "inner"s, "end"s}));
}

TEST_F(SharedSynchronizable, CannotPostWithoutAnyReferenceLeft) {
  Subject::make_shared_ptr(new Subject(record)).reset();
  record.ended.acquire();
  EXPECT_TRUE(record.postingInTheEndFailed);
}

TEST_F(SharedSynchronizable, CannotPostBeforeItIsShared) {
  const auto subject = std::make_unique<Subject>(record);
  EXPECT_THROW(subject->post([] {}), std::bad_weak_ptr);
}

TEST_F(SharedSynchronizable, WithoutMemoryForThePointerEndsOnItsQueueAndPassesTheFailureOn) {
  auto* subject = new Subject(record);
  nextAllocationFails = true;
  EXPECT_THROW((void)Subject::make_shared_ptr(subject), std::bad_alloc);
  record.ended.acquire();
  EXPECT_TRUE(record.endedOnItsQueue);
}

TEST_F(SharedSynchronizable, TakesReferencesAndWorkFromManyThreads) {
  std::atomic<int> runs = 0;
  {
    const auto subject = Subject::make_shared_ptr(new Subject(record));
    std::vector<std::thread> threads;
    for (int thread = 0; thread < 4; ++thread) {
      threads.emplace_back([copy = subject, &runs] {
        for (int round = 0; round < 250; ++round) copy->post([&runs] { ++runs; });
      });
    }
    for (std::thread& thread : threads) thread.join();
  }
  record.ended.acquire();
  EXPECT_EQ(runs, 1000);
}

}  // namespace
