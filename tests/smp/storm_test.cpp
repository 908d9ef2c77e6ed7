// SPDX-License-Identifier: Apache-2.0
// What a memory minimum is worth when the whole machine is out of memory and the kernel kills: a
// storm of at least fifty kills, under hogs of five kinds.
#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <fstream>
#include <memory>
#include <thread>

#include "hogs.h"
#include "linux_world.h"

namespace Uml {
namespace {

using Clock = std::chrono::steady_clock;

constexpr int kKills = 50;
constexpr std::chrono::seconds kLimit{150};

void setOwnScore(const char *score) {
  std::ofstream("/proc/self/oom_score_adj") << score;
}

// A process that joined a pool by knobctl, as any tool would put it there, and holds memory then.
class Member {
 public:
  Member(::Test::World *world, const std::string &pool, size_t megabytes) {
    if (pipe(start_) != 0) throw std::system_error(errno, std::generic_category(), "pipe");
    worker_ = std::make_unique<Worker>("", [this, megabytes] {
      setOwnScore("0");
      char byte = 0;
      if (read(start_[0], &byte, 1) == 1) holdMB(megabytes)();
    });
    const auto joined = world->run("knobctl", {"join", pool, std::to_string(worker_->pid())});
    EXPECT_EQ(joined.status, 0) << joined.err;
    if (write(start_[1], "x", 1) != 1) ADD_FAILURE() << "the member does not start";
    EXPECT_TRUE(worker_->waitUntilDone());
  }
  ~Member() {
    close(start_[0]);
    close(start_[1]);
  }
  Member(const Member &) = delete;
  Member &operator=(const Member &) = delete;

  bool alive() { return worker_->alive(); }

 private:
  int start_[2];
  std::unique_ptr<Worker> worker_;
};

class Storm : public LinuxTest {
 protected:
  // The test itself is never killed. What it starts is as likely to be as any process.
  Storm() { setOwnScore("-1000"); }
  ~Storm() override { setOwnScore("0"); }

  // Lets the hogs loose until the kernel has killed that often, or the condition is false.
  template <typename F>
  long killsWhile(F condition) {
    const long before = Bench::machineWideKills();
    Bench::Hogs hogs(world.folder(), "hogs");
    const auto end = Clock::now() + kLimit;
    long kills = 0;
    while (kills < kKills && condition() && Clock::now() < end) {
      hogs.restartEnded();
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
      kills = Bench::machineWideKills() - before;
    }
    return kills;
  }
};

TEST_F(Storm, FiftyKillsLeaveEachProcessOfAPoolWithinItsMinimum) {
  ASSERT_TRUE(silentlyDone(load("- name: kept\n  memMin: 120\n")));
  std::vector<std::unique_ptr<Member>> members;
  for (const size_t megabytes : {60U, 20U, 10U, 1U})
    members.push_back(std::make_unique<Member>(&world, "host/opt/kept", megabytes));
  const auto allAlive = [&] {
    for (const auto &member : members)
      if (!member->alive()) return false;
    return true;
  };
  EXPECT_GE(killsWhile(allAlive), kKills);
  EXPECT_TRUE(allAlive());
  EXPECT_EQ(numberIn("host/opt/kept", "memory.events.local", "oom_kill"), 0);
}

TEST_F(Storm, AProcessFarBeyondItsPoolsMinimumIsTheFirstToDie) {
  ASSERT_TRUE(silentlyDone(load("- name: greedy\n  memMin: 8\n")));
  Member greedy(&world, "host/opt/greedy", 120);
  EXPECT_LT(killsWhile([&] { return greedy.alive(); }), kKills);
  EXPECT_FALSE(greedy.alive());
}

}  // namespace
}  // namespace Uml
