// SPDX-License-Identifier: Apache-2.0
// What posting costs the thread that posts: no allocation, no page fault, and no system call that a filter would see.
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstddef>
#include <fstream>

#include "tests/clients/LibraryFixture.h"
#include "tests/host/InChild.h"

namespace {

// Of the thread that counts.
thread_local bool counting = false;
thread_local unsigned long allocations = 0;

void count() {
  allocations += counting ? 1U : 0U;
}

}  // namespace

// In place of the C library's, for this program and the libraries in it.
extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* memory, std::size_t size);
void __libc_free(void* memory);
void* malloc(std::size_t size) noexcept {
  count();
  return __libc_malloc(size);
}
void* calloc(std::size_t items, std::size_t size) noexcept {
  count();
  return __libc_calloc(items, size);
}
void* realloc(void* memory, std::size_t size) noexcept {
  count();
  return __libc_realloc(memory, size);
}
void free(void* memory) noexcept {
  count();
  __libc_free(memory);
}
}

namespace tarn::reporting {
namespace {

constexpr int kPosts = 20000;

class HotCall : public LibraryFixture {
 protected:
  // Fills the ring and goes on posting; how many posts were neither done nor dropped.
  int postMany(int posts = kPosts) {
    int odd = 0;
    for (int i = 0; i < posts; ++i) {
      const int result = post(i, "BuiltInSpeaker");
      odd += result == TARNREPORTING_OK || result == TARNREPORTING_DROPPED ? 0 : 1;
    }
    return odd;
  }
};

// Ends the process at any system call but a write and the end itself. False when the system takes no filter.
bool allowWritesOnly() {
  sock_filter filter[] = {
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_exit_group, 2, 0),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_write, 1, 0),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_KILL_PROCESS),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
  };
  const sock_fprog program{static_cast<unsigned short>(std::size(filter)), filter};
  return ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 && ::prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) == 0;
}

TEST_F(HotCall, MakesNoSystemCall) {
  const int outcome = testing::inChild([this] {
    openAll("/nowhere/socket");
    postMany(10);
    if (!allowWritesOnly()) return 2;
    return postMany() == 0 ? 0 : 1;
  });
  EXPECT_EQ(outcome, 0);  // -1: it was ended
}

TEST_F(HotCall, TheFilterOfTheTestAboveSeesASystemCall) {
  EXPECT_EQ(testing::inChild([] {
              if (!allowWritesOnly()) return 2;
              ::getppid();
              return 0;
            }),
            -1);
}

TEST_F(HotCall, AllocatesNothing) {
  openAll("/nowhere/socket");
  counting = true;
  const int odd = postMany();
  counting = false;
  EXPECT_EQ(odd, 0);
  EXPECT_EQ(allocations, 0U);
  counting = true;
  const std::string grown(1000, 'a');
  counting = false;
  EXPECT_GT(allocations, 0U) << grown;  // it does count
}

TEST_F(HotCall, MeetsNoPageFaultOnceWarm) {
  openAll("/nowhere/socket");
  rusage before{};
  rusage after{};
  postMany(10);
  ::getrusage(RUSAGE_THREAD, &after);
  ::getrusage(RUSAGE_THREAD, &before);
  const int odd = postMany();
  ::getrusage(RUSAGE_THREAD, &after);
  EXPECT_EQ(odd, 0);
  EXPECT_EQ(after.ru_minflt - before.ru_minflt, 0);
  EXPECT_EQ(after.ru_majflt - before.ru_majflt, 0);
}

// Of this process, in KiB.
long residentKiB() {
  std::ifstream file("/proc/self/statm");
  long all = 0;
  long resident = 0;
  file >> all >> resident;
  return resident * (::sysconf(_SC_PAGESIZE) / 1024);
}

TEST_F(HotCall, AClientAndItsWriterTakeLessMemoryThanTheHeaderSays) {
  const int outcome = testing::inChild([this] {
    constexpr long kClients = 16;
    openAll("/nowhere/socket");
    const long before = residentKiB();
    for (long i = 0; i < kClients; ++i) {
      openAll("/nowhere/socket");
      postMany();
    }
    return static_cast<int>((residentKiB() - before) / kClients / 4);  // an exit status is small
  });
  EXPECT_GE(outcome, 256 / 4);  // the ring alone
  EXPECT_LT(outcome, 512 / 4);
}

}  // namespace
}  // namespace tarn::reporting
