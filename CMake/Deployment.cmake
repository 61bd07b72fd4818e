# SPDX-License-Identifier: Apache-2.0
# What a deployment chooses. The program reads no configuration file, and no environment variable but
# those by which a launcher hands its port over, so everything that may differ between two handset
# distributions is a constant of the build. Names of the installation are in Install.cmake.

set(HALVEC_PORTS_DIRECTORY "/run/halvec/ports" CACHE STRING
    "Directory that holds the sockets of named message ports")
set(HALVEC_ENTITLEMENT_DIRECTORIES "/etc/halvec/entitlements.d:/usr/share/halvec/entitlements.d"
    CACHE STRING "Directories of entitlement property lists, first match wins, separated by colons")
set(HALVEC_MANIFEST_HOST "configuration.zarvo.example" CACHE STRING
    "Host of the LASD version manifest, fetched by https")
set(HALVEC_HEARTBEAT_TARGET "192.0.2.1" CACHE STRING
    "IPv4 address that the data-path heartbeat sends its echo requests to")
set(HALVEC_GEOCODER_ENDPOINT "" CACHE STRING
    "Base URL of a Nominatim-compatible https service; empty: the offline atlas alone")
if(HALVEC_GEOCODER_ENDPOINT AND NOT HALVEC_GEOCODER_ENDPOINT MATCHES "^https://[^/]+.*[^/]$")
  message(FATAL_ERROR "HALVEC_GEOCODER_ENDPOINT must be an https URL without a slash at its end: "
                      "where the handset is concerns nobody on the way")
endif()
set(HALVEC_ATLAS_FILE "/usr/share/halvec/atlas.bin" CACHE STRING
    "The offline geocoder's data file")
set(HALVEC_VOICEMAIL_LIBRARY "/usr/lib/halvec/libvisual-voicemail.so" CACHE STRING
    "Path of the visual-voicemail library, opened at the first subscription query")
set(HALVEC_VOICEMAIL_SYMBOL "VisualVoicemailIsSubscribed" CACHE STRING
    "Its function without arguments that tells by an 8-bit boolean whether the service is subscribed")
set(HALVEC_TOKEN_STORE "/var/lib/halvec-mobile-helper/voicemail-tokens.db" CACHE STRING
    "File of the voicemail token store; its folder is made, readable by nobody else, when missing")
set(HALVEC_OBSERVER_SOCKET "" CACHE STRING
    "Socket on which root watches the running helper (halvecctl status, monitor); empty: none")
option(HALVEC_CONFINE "The helper confines itself at start, as far as its launcher has not" ON)

option(HALVEC_BUILD_TESTS "Build the test programs" ON)
option(HALVEC_BUILD_BENCHMARKS "Build the benchmark programs" ON)
option(HALVEC_WARNINGS_AS_ERRORS "A compiler's warning ends the build" ON)
option(HALVEC_BUILD_FUZZERS "Build the fuzz targets (needs clang)" OFF)
set(HALVEC_SANITIZE "" CACHE STRING "Sanitizers for the whole tree, for example address,undefined")
if(HALVEC_SANITIZE)
  # The leak detector traces the process from a process of its own, which the confinement forbids.
  set(HALVEC_CONFINE OFF)
endif()
