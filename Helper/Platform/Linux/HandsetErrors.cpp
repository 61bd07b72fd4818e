// SPDX-License-Identifier: Apache-2.0
//
// The two systems share the numbers up to 34, 11 apart; beyond that a table says which is which.
#include "Helper/Platform/Linux/HandsetErrors.h"

#include <algorithm>
#include <array>
#include <cerrno>

namespace platform {
namespace {

struct Pair {
  int here;
  HandsetError handset;
};

constexpr int kLastShared = ERANGE;

// clang-format off
constexpr std::array kPairs{
    Pair{EAGAIN, 35},      Pair{EDEADLK, 11},      Pair{EINPROGRESS, 36},     Pair{EALREADY, 37},
    Pair{ENOTSOCK, 38},    Pair{EDESTADDRREQ, 39}, Pair{EMSGSIZE, 40},        Pair{EPROTOTYPE, 41},
    Pair{ENOPROTOOPT, 42}, Pair{EPROTONOSUPPORT, 43}, Pair{ESOCKTNOSUPPORT, 44}, Pair{EOPNOTSUPP, 45},
    Pair{EPFNOSUPPORT, 46}, Pair{EAFNOSUPPORT, 47}, Pair{EADDRINUSE, 48},     Pair{EADDRNOTAVAIL, 49},
    Pair{ENETDOWN, 50},    Pair{ENETUNREACH, 51},  Pair{ENETRESET, 52},       Pair{ECONNABORTED, 53},
    Pair{ECONNRESET, 54},  Pair{ENOBUFS, 55},      Pair{EISCONN, 56},         Pair{ENOTCONN, 57},
    Pair{ESHUTDOWN, 58},   Pair{ETOOMANYREFS, 59}, Pair{ETIMEDOUT, 60},       Pair{ECONNREFUSED, 61},
    Pair{ELOOP, 62},       Pair{ENAMETOOLONG, 63}, Pair{EHOSTDOWN, 64},       Pair{EHOSTUNREACH, 65},
    Pair{ENOTEMPTY, 66},   Pair{EUSERS, 68},       Pair{EDQUOT, 69},          Pair{ESTALE, 70},
    Pair{ENOLCK, 77},      Pair{ENOSYS, 78},       Pair{EOVERFLOW, 84},       Pair{ECANCELED, 89}};
// clang-format on

}  // namespace

HandsetError HandsetErrorOf(int error) noexcept {
  const auto* const pair = std::find_if(kPairs.begin(), kPairs.end(),
                                        [error](const Pair& p) { return p.here == error; });
  if (pair != kPairs.end()) return pair->handset;
  return error >= 0 && error <= kLastShared ? error : handset::kInputOutput;
}

}  // namespace platform
