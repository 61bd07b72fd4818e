// SPDX-License-Identifier: Apache-2.0
//
// The two predicates that a request asks before it touches a path that its client named. Any
// thread; they change nothing on disk. The rules themselves are platform::PathRules.
#pragma once

/// Whether a link may be made at `path`, a C string: it is exactly one of twenty fixed entries, and
/// no directory or FIFO stands there. A match is logged at info level; a refusal is not logged.
[[nodiscard]] bool IsAllowedLinkPath(const char* path);

/// Whether an entry may be removed or an item placed at `path`, a C string: it lies in one of the
/// two carrier-bundles directories, or IsAllowedLinkPath() allows it, or it is a carrier-bundle
/// package below /tmp. The first two are logged at info level.
/// Kept: before the package rule is asked, three error lines say that the path is not allowed; they
/// stand in the log even when that rule then allows it, and nothing logs what it answered.
[[nodiscard]] bool IsAllowedPath(const char* path);
