# SPDX-License-Identifier: Apache-2.0
# What a deployment chooses. The program reads no configuration file and no environment variable,
# so everything that may differ between two handset distributions is a constant of the build.

set(HALVEC_PORTS_DIRECTORY "/run/halvec/ports" CACHE STRING
    "Directory that holds the sockets of named message ports")
set(HALVEC_ENTITLEMENT_DIRECTORIES "/etc/halvec/entitlements.d:/usr/share/halvec/entitlements.d"
    CACHE STRING "Directories of entitlement property lists, first match wins, separated by colons")

option(HALVEC_BUILD_TESTS "Build the test programs" ON)
option(HALVEC_BUILD_BENCHMARKS "Build the benchmark programs" ON)
option(HALVEC_BUILD_FUZZERS "Build the fuzz targets (needs clang)" OFF)
set(HALVEC_SANITIZE "" CACHE STRING "Sanitizers for the whole tree, for example address,undefined")
