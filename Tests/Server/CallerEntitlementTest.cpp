// SPDX-License-Identifier: Apache-2.0
//
// Who may connect, what is remembered of it, and when it is forgotten.
#include "Helper/Shared/Server/CallerEntitlement.h"

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <thread>

#include "Helper/Platform/ProcessExit.h"
#include "Helper/Platform/ProcessIdentity.h"
#include "Tests/Fakes/FakeCallerSecurity.h"

namespace {

using platform::PropertyList;

/// A child that lives until it is told to end.
class Child {
 public:
  Child() {
    int ends[2];
    if (::pipe(ends) != 0) ADD_FAILURE() << "pipe failed";
    process_ = ::fork();
    if (process_ == 0) {
      ::close(ends[1]);
      char byte = 0;
      (void)!::read(ends[0], &byte, 1);
      ::_exit(0);
    }
    ::close(ends[0]);
    end_.reset(ends[1]);
  }
  ~Child() { end(); }
  /// Ends the child; it stays a zombie until it is reaped here.
  void end() {
    if (process_ == 0) return;
    end_.reset();
    siginfo_t information{};
    (void)::waitid(P_PID, static_cast<id_t>(process_), &information, WEXITED | WNOWAIT);
  }
  void reap() {
    end();
    (void)::waitpid(std::exchange(process_, 0), nullptr, 0);
  }
  [[nodiscard]] wire::AuditToken token() const {
    wire::AuditToken token;
    token.words[5] = static_cast<std::uint32_t>(process_);
    const platform::FileDescriptor pidfd = platform::OpenPidfd(process_);
    token.words[7] = platform::ProcessVersion(pidfd.get(), process_);
    return token;
  }

 private:
  pid_t process_ = 0;
  platform::FileDescriptor end_;
};

class CallerEntitlement : public ::testing::Test {
 protected:
  ~CallerEntitlement() override {
    child.reap();
    platform::DeliverPendingProcessExits();
  }
  bool asks(const PropertyList& value) {
    security.answer("name", {.value = value});
    return CallerHasEntitlement("name", child.token());
  }
  fakes::FakeCallerSecurity security;
  platform::ScopedReplacement<platform::CallerSecurity> replacement{security};
  Child child;
};

TEST_F(CallerEntitlement, IsHeldWithTheBooleanTrueOnly) {
  EXPECT_FALSE(asks("true"));
  EXPECT_FALSE(asks(1));
  EXPECT_FALSE(asks(1.0));
  EXPECT_FALSE(asks(PropertyList::Array{PropertyList(true)}));
  EXPECT_FALSE(asks(PropertyList::Dictionary()));
  EXPECT_FALSE(asks(false));
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 0U);
  EXPECT_TRUE(asks(true));
}

TEST_F(CallerEntitlement, IsRefusedWhenTheAnswerIsTrueTogetherWithAnError) {
  security.answer("name", {.value = PropertyList(true), .error = true});
  EXPECT_FALSE(CallerHasEntitlement("name", child.token()));
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 0U);
}

TEST_F(CallerEntitlement, IsRefusedWithoutAValue) {
  EXPECT_FALSE(CallerHasEntitlement("name", child.token()));
}

TEST_F(CallerEntitlement, IsRefusedWhenTheProcessCannotBeExamined) {
  security.grant("name");
  security.withholdTask();
  EXPECT_FALSE(CallerHasEntitlement("name", child.token()));
  EXPECT_EQ(security.questions(), 0);
}

TEST_F(CallerEntitlement, IsAnsweredFromTheCacheTheSecondTime) {
  EXPECT_TRUE(asks(true));
  security.answer("name", {});
  EXPECT_TRUE(CallerHasEntitlement("name", child.token()));
  EXPECT_EQ(security.questions(), 1);
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 1U);
  EXPECT_EQ(GetEntitlementRegistrySize().watchers, 1U);
}

TEST_F(CallerEntitlement, IsCachedByNameUnderOneWatcher) {
  security.grant("name");
  security.grant("other");
  EXPECT_TRUE(CallerHasEntitlement("name", child.token()));
  EXPECT_TRUE(CallerHasEntitlement("other", child.token()));
  EXPECT_EQ(security.questions(), 2);
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 2U);
  EXPECT_EQ(GetEntitlementRegistrySize().watchers, 1U);
}

TEST_F(CallerEntitlement, IsForgottenWithItsWatcherWhenTheProcessExits) {
  EXPECT_TRUE(asks(true));
  child.end();
  platform::DeliverPendingProcessExits();
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 0U);
  EXPECT_EQ(GetEntitlementRegistrySize().watchers, 0U);
}

TEST_F(CallerEntitlement, IsNotInheritedByALaterProcessWithTheSameId) {
  EXPECT_TRUE(asks(true));
  wire::AuditToken later = child.token();
  ++later.words[7];
  security.answer("name", {});
  EXPECT_FALSE(CallerHasEntitlement("name", later));
}

TEST_F(CallerEntitlement, IsCachedWithoutAWatcherWhenTheProcessCannotBeWatched) {
  const wire::AuditToken token = child.token();
  child.reap();
  security.grant("name");
  EXPECT_TRUE(CallerHasEntitlement("name", token));
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 1U);
  EXPECT_EQ(GetEntitlementRegistrySize().watchers, 0U);
  HandleProcessExit(platform::AuditTokenProcess(token));
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 0U);
}

TEST_F(CallerEntitlement, MayBeAskedByManyThreadsWhileProcessesEnd) {
  security.grant("name");
  // Only the fake is not made for threads; the first question fills the cache for the rest.
  EXPECT_TRUE(CallerHasEntitlement("name", child.token()));
  const wire::AuditToken token = child.token();
  std::vector<std::thread> threads;
  for (int index = 0; index < 4; ++index) {
    threads.emplace_back([token] {
      for (int round = 0; round < 200; ++round) {
        platform::DeliverPendingProcessExits();
        (void)GetEntitlementRegistrySize();
        HandleProcessExit(-1);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_TRUE(CallerHasEntitlement("name", token));
}

using CallerEntitlementDeathTest = CallerEntitlement;

TEST_F(CallerEntitlementDeathTest, ExitHandlerAfterTheAtExitHandlerFindsNoTablesAndDoesNothing) {
  ::testing::FLAGS_gtest_death_test_style = "threadsafe";
  EXPECT_EXIT(
      {
        security.grant("name");
        const bool granted = CallerHasEntitlement("name", child.token());
        ReleaseEntitlementRegistry();
        HandleProcessExit(platform::AuditTokenProcess(child.token()));
        ReleaseEntitlementRegistry();
        const bool again = CallerHasEntitlement("name", child.token());
        const EntitlementRegistrySize size = GetEntitlementRegistrySize();
        ::_exit(granted && again && size.grants == 0 && size.watchers == 0 ? 0 : 1);
      },
      ::testing::ExitedWithCode(0), "");
}

}  // namespace
