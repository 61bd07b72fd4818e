// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/SharedLibrary.h"

#include <dlfcn.h>

namespace platform {
namespace {

std::string LinkerError() {
  const char* text = ::dlerror();
  return text ? text : "unknown";
}

}  // namespace

SharedLibrary::SharedLibrary(const char* name)
    : handle_(::dlopen(name, RTLD_LAZY | RTLD_LOCAL)), complete_(handle_ != nullptr) {
  if (!complete_) failure_ = LinkerError();
}

void* SharedLibrary::find(const char* symbol) {
  void* address = handle_ ? ::dlsym(handle_, symbol) : nullptr;
  if (!address && complete_) {
    complete_ = false;
    failure_ = LinkerError();
  }
  return address;
}

}  // namespace platform
