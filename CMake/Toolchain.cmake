# SPDX-License-Identifier: Apache-2.0
# Compiler and linker settings shared by every target.

add_library(ProjectOptions INTERFACE)
target_compile_options(ProjectOptions INTERFACE -Wall -Wextra -Wconversion
                       -fstack-protector-strong -ffunction-sections -fdata-sections)
if(HALVEC_WARNINGS_AS_ERRORS)
  target_compile_options(ProjectOptions INTERFACE -Werror)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  # GCC 12 sees overlapping copies in its own string concatenation that cannot happen (PR 105651).
  target_compile_options(ProjectOptions INTERFACE $<$<COMPILE_LANGUAGE:CXX>:-Wno-restrict>)
endif()
target_link_options(ProjectOptions INTERFACE -Wl,-z,relro -Wl,-z,now -Wl,--as-needed -Wl,--gc-sections)
target_include_directories(ProjectOptions INTERFACE ${PROJECT_SOURCE_DIR})
# The standard library's own bound checks are part of the product: one privileged process is
# worth more than the few instructions that they cost.
target_compile_definitions(ProjectOptions INTERFACE _GLIBCXX_ASSERTIONS)

if(CMAKE_BUILD_TYPE STREQUAL "Release" AND NOT HALVEC_SANITIZE)
  target_compile_definitions(ProjectOptions INTERFACE _FORTIFY_SOURCE=2)
endif()

if(HALVEC_SANITIZE)
  target_compile_options(ProjectOptions INTERFACE -fsanitize=${HALVEC_SANITIZE}
                         -fno-sanitize-recover=all -fno-omit-frame-pointer -g1)
  target_link_options(ProjectOptions INTERFACE -fsanitize=${HALVEC_SANITIZE})
  if(HALVEC_SANITIZE MATCHES "thread")
    # asio's fences are on by default and the thread sanitizer does not model them.
    target_compile_definitions(ProjectOptions INTERFACE ASIO_DISABLE_FENCED_BLOCK)
  endif()
endif()
