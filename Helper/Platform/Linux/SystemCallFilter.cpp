// SPDX-License-Identifier: Apache-2.0
//
// What is refused stands in two tables: calls that no request needs whatever their arguments, and
// calls that are needed with some arguments only. Everything else is allowed, because libraries
// that are opened later, the vendor's among them, may need it.
#include "Helper/Platform/Linux/SystemCallFilter.h"

#include <fcntl.h>
#include <linux/audit.h>
#include <linux/filter.h>
#include <linux/sched.h>
#include <linux/seccomp.h>
#include <linux/sockios.h>
#include <sys/mman.h>
#include <sys/shm.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <bit>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <span>

namespace platform {
namespace {

#if defined(__x86_64__)
constexpr std::uint32_t kArchitecture = AUDIT_ARCH_X86_64;
#elif defined(__aarch64__)
constexpr std::uint32_t kArchitecture = AUDIT_ARCH_AARCH64;
#endif

/// The last call that these tables were checked against.
constexpr std::uint32_t kYoungest = SYS_set_mempolicy_home_node;

constexpr std::array kRefused {
  // Other programs and other processes. The helper is one process that runs nothing.
  SYS_execve, SYS_execveat, SYS_ptrace, SYS_process_vm_readv, SYS_process_vm_writev, SYS_kcmp,
      SYS_pidfd_getfd, SYS_pidfd_send_signal, SYS_kill, SYS_tkill, SYS_rt_sigqueueinfo,
      SYS_rt_tgsigqueueinfo, SYS_process_madvise, SYS_process_mrelease,
      // Other identities.
      SYS_setuid, SYS_setgid, SYS_setreuid, SYS_setregid, SYS_setresuid, SYS_setresgid,
      SYS_setfsuid, SYS_setfsgid, SYS_setgroups, SYS_personality,
      // Another view of the file system, and files that no folder leads to.
      SYS_mount, SYS_umount2, SYS_move_mount, SYS_open_tree, SYS_fsopen, SYS_fsconfig, SYS_fsmount,
      SYS_fspick, SYS_mount_setattr, SYS_pivot_root, SYS_chroot, SYS_unshare, SYS_setns,
      SYS_mknodat, SYS_open_by_handle_at, SYS_swapon, SYS_swapoff, SYS_quotactl, SYS_quotactl_fd,
      SYS_fanotify_init,
      // The kernel itself, and the parts of it with the richest history of defects.
      SYS_init_module, SYS_finit_module, SYS_delete_module, SYS_kexec_load, SYS_kexec_file_load,
      SYS_reboot, SYS_bpf, SYS_perf_event_open, SYS_userfaultfd, SYS_io_uring_setup,
      SYS_io_uring_enter, SYS_io_uring_register, SYS_add_key, SYS_request_key, SYS_keyctl,
      SYS_syslog, SYS_acct, SYS_vhangup, SYS_lookup_dcookie, SYS_nfsservctl,
      // The machine's clock, name and priorities.
      SYS_settimeofday, SYS_clock_settime, SYS_clock_adjtime, SYS_adjtimex, SYS_sethostname,
      SYS_setdomainname, SYS_sched_setscheduler, SYS_sched_setattr, SYS_sched_setparam,
      SYS_setpriority, SYS_ioprio_set, SYS_migrate_pages, SYS_move_pages, SYS_mbind,
      SYS_set_mempolicy,
#if defined(__x86_64__)
      SYS_fork, SYS_vfork, SYS_mknod, SYS_modify_ldt, SYS_iopl, SYS_ioperm,
#endif
};

/// A call that is judged by one argument: the argument's bits in `mask` are one of `values`, and
/// then the call is allowed or refused, and otherwise the opposite.
struct Condition {
  std::uint32_t call;
  std::uint32_t argument;
  std::uint32_t mask;
  std::span<const std::uint32_t> values;
  bool allowed;
};

constexpr std::uint32_t kAll = ~std::uint32_t{0};
constexpr std::array<std::uint32_t, 4> kFamilies{AF_UNIX, AF_INET, AF_INET6, AF_NETLINK};
constexpr std::array<std::uint32_t, 1> kThread{CLONE_THREAD};
constexpr std::array<std::uint32_t, 1> kExecutable{PROT_EXEC};
constexpr std::array<std::uint32_t, 1> kExecutableSegment{SHM_EXEC};
constexpr std::array<std::uint32_t, 1> kWritableCode{PROT_WRITE | PROT_EXEC};
constexpr std::uint32_t kSetIds = S_ISUID | S_ISGID;
constexpr std::array<std::uint32_t, 1> kNone{0};
constexpr std::array<std::uint32_t, 2> kOwnerCommands{F_SETOWN, F_SETOWN_EX};
constexpr std::array<std::uint32_t, 2> kOwnerRequests{FIOSETOWN, SIOCSPGRP};
/// Stands for the number of the process, which is known at its start only.
constexpr std::array<std::uint32_t, 1> kThisProcess{~std::uint32_t{0}};

constexpr std::array kConditions {
  Condition{SYS_socket, 0, kAll, kFamilies, true},
      // A thread, never a process.
      Condition{SYS_clone, 0, CLONE_THREAD, kThread, true},
      // A signal to this process, as it takes to abort; nor may the kernel be asked to send one to
      // another when something happens on a descriptor.
      Condition{SYS_tgkill, 0, kAll, kThisProcess, true},
      Condition{SYS_fcntl, 1, kAll, kOwnerCommands, false},
      Condition{SYS_ioctl, 1, kAll, kOwnerRequests, false},
      // This process's own limits.
      Condition{SYS_prlimit64, 0, kAll, kNone, true},
      // No memory that is written first and run then.
      Condition{SYS_mmap, 2, PROT_WRITE | PROT_EXEC, kWritableCode, false},
      Condition{SYS_mprotect, 2, PROT_EXEC, kExecutable, false},
      Condition{SYS_pkey_mprotect, 2, PROT_EXEC, kExecutable, false},
      Condition{SYS_shmat, 2, SHM_EXEC, kExecutableSegment, false},
      // No file that gives its owner's rights to whoever runs it.
      Condition{SYS_fchmod, 1, kSetIds, kNone, true},
      Condition{SYS_fchmodat, 2, kSetIds, kNone, true},
      Condition{SYS_openat, 3, kSetIds, kNone, true},
      Condition{SYS_mkdirat, 2, kSetIds, kNone, true},
#if defined(__x86_64__)
      Condition{SYS_chmod, 1, kSetIds, kNone, true}, Condition{SYS_open, 2, kSetIds, kNone, true},
      Condition{SYS_creat, 1, kSetIds, kNone, true}, Condition{SYS_mkdir, 1, kSetIds, kNone, true},
#endif
};

constexpr std::uint32_t kAllow = SECCOMP_RET_ALLOW;
constexpr std::uint32_t kRefuse = SECCOMP_RET_ERRNO | EPERM;
constexpr std::uint32_t kUnknown = SECCOMP_RET_ERRNO | ENOSYS;

/// A call that is not simply allowed; without a condition it is refused.
struct Entry {
  std::uint32_t call;
  const Condition* condition;
};

constexpr auto SortedEntries() {
  std::array<Entry, kRefused.size() + kConditions.size()> entries{};
  auto next = entries.begin();
  for (const int call : kRefused) *next++ = {static_cast<std::uint32_t>(call), nullptr};
  for (const Condition& condition : kConditions) *next++ = {condition.call, &condition};
  std::sort(entries.begin(), entries.end(),
            [](const Entry& left, const Entry& right) { return left.call < right.call; });
  return entries;
}

/// A program while it is written, with room for more than it needs.
struct Program {
  std::array<sock_filter, 512> instructions{};
  std::size_t count = 0;

  constexpr void append(sock_filter instruction) { instructions[count++] = instruction; }
};

constexpr void Return(Program& program, std::uint32_t verdict) {
  program.append({BPF_RET | BPF_K, 0, 0, verdict});
}

constexpr void Load(Program& program, std::size_t offset) {
  program.append({BPF_LD | BPF_W | BPF_ABS, 0, 0, static_cast<std::uint32_t>(offset)});
}

/// Compares with `value` and skips so many instructions.
constexpr void Jump(Program& program, std::uint16_t test, std::uint32_t value,
                    std::size_t skippedIfTrue, std::size_t skippedIfFalse) {
  program.append({static_cast<std::uint16_t>(BPF_JMP | BPF_K | test),
                  static_cast<std::uint8_t>(skippedIfTrue),
                  static_cast<std::uint8_t>(skippedIfFalse), value});
}

/// Load, mask, one comparison for each value, two verdicts.
constexpr std::size_t SizeOf(const Condition& condition) { return condition.values.size() + 4; }

constexpr void Add(Program& program, const Condition& condition) {
  static_assert(std::endian::native == std::endian::little, "the low half of an argument is first");
  Load(program, offsetof(seccomp_data, args) + sizeof(std::uint64_t) * condition.argument);
  program.append({BPF_ALU | BPF_AND | BPF_K, 0, 0, condition.mask});
  for (std::size_t left = condition.values.size(); const std::uint32_t value : condition.values) {
    Jump(program, BPF_JEQ, value, left--, 0);
  }
  Return(program, condition.allowed ? kRefuse : kAllow);
  Return(program, condition.allowed ? kAllow : kRefuse);
}

/// Judges the calls of one stretch of the sorted entries: one comparison for each, the two
/// verdicts, then the conditions. What lies beyond the stretch skips it, so that no call is
/// compared with all.
constexpr void AddStretch(Program& program, std::span<const Entry> entries) {
  std::size_t conditions = 0;
  for (const Entry& entry : entries) conditions += entry.condition ? SizeOf(*entry.condition) : 0;
  Jump(program, BPF_JGT, entries.back().call, entries.size() + 2 + conditions, 0);
  std::size_t refusal = entries.size();
  std::size_t block = refusal + 1;
  for (const Entry& entry : entries) {
    Jump(program, BPF_JEQ, entry.call, entry.condition ? block : refusal, 0);
    block += entry.condition ? SizeOf(*entry.condition) : 0;
    --refusal;
    --block;
  }
  Return(program, kAllow);
  Return(program, kRefuse);
  for (const Entry& entry : entries) {
    if (entry.condition) Add(program, *entry.condition);
  }
}

constexpr Program Build() {
  constexpr std::size_t kStretch = 10;
  constexpr auto kEntries = SortedEntries();
  Program program;
  Load(program, offsetof(seccomp_data, arch));
  Jump(program, BPF_JEQ, kArchitecture, 1, 0);
  Return(program, SECCOMP_RET_KILL_PROCESS);
  Load(program, offsetof(seccomp_data, nr));
  // What these are asked for stands in memory, where no filter can see it; who needs them falls
  // back to their older forms.
  Jump(program, BPF_JEQ, SYS_clone3, 2, 0);
  Jump(program, BPF_JEQ, SYS_openat2, 1, 0);
  Jump(program, BPF_JGT, kYoungest, 0, 1);
  Return(program, kUnknown);
  for (std::span<const Entry> left(kEntries); !left.empty();) {
    const std::size_t count = std::min(left.size(), kStretch);
    AddStretch(program, left.first(count));
    left = left.subspan(count);
  }
  Return(program, kAllow);
  return program;
}

/// Made by the compiler, because a start has no time for it.
constexpr auto kProgram = [] {
  constexpr Program kBuilt = Build();
  std::array<sock_filter, kBuilt.count> program{};
  std::copy_n(kBuilt.instructions.begin(), program.size(), program.begin());
  return program;
}();

constexpr bool ComparesWithThisProcess(const sock_filter& instruction) {
  return instruction.code == (BPF_JMP | BPF_K | BPF_JEQ) && instruction.k == kThisProcess[0];
}
static_assert(std::ranges::count_if(kProgram, ComparesWithThisProcess) == 1);

}  // namespace

bool FilterSystemCalls() {
  auto program = kProgram;
  std::ranges::find_if(program, ComparesWithThisProcess)->k =
      static_cast<std::uint32_t>(::getpid());
  const sock_fprog filter{program.size(), program.data()};
  return ::syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, 0, &filter) == 0;
}

}  // namespace platform
