// SPDX-License-Identifier: Apache-2.0
#include "Tests/Files/ArchiveForTest.h"

#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

namespace files_test {
namespace {

constexpr char kPython[] = R"(
import struct, sys, warnings, zipfile
warnings.simplefilter("ignore")  # about duplicate names
patches = {}
def item(name, mode, data=b"", when=(2020, 2, 3, 4, 5, 6), **options):
    info = zipfile.ZipInfo(name, when)
    info.create_system = 3
    info.external_attr = mode << 16
    z.writestr(info, data, zipfile.ZIP_DEFLATED, **options)
def file(name, data=b"text", mode=0o644, **options): item(name, 0o100000 | mode, data, **options)
def folder(name, mode=0o755): item(name + "/", 0o040000 | mode)
def link(name, target): item(name, 0o120777, target)
def sidecar(attributes={}, finder=b"", resource=b""):
    names = [name.encode() + b"\0" for name in attributes]
    values = list(attributes.values())
    table_end = 120 + sum((11 + len(name) + 3) // 4 * 4 for name in names)
    table, offset = b"", table_end
    for name, value in zip(names, values):
        entry = struct.pack(">IIHB", offset, len(value), 0, len(name)) + name
        table += entry + bytes(-len(entry) % 4)
        offset += len(value)
    header = struct.pack(">4sIIII12xHH", b"ATTR", 0, offset, table_end, offset - table_end, 0,
                         len(names))
    body = finder.ljust(32, b"\0") + bytes(2) + header + table + b"".join(values)
    return (struct.pack(">II16xH", 0x00051607, 0x00020000, 2) +
            struct.pack(">III", 9, 50, len(body)) +
            struct.pack(">III", 2, 50 + len(body), len(resource)) + body + resource)
with zipfile.ZipFile(sys.argv[1], "w") as z:
    exec(sys.argv[2])
if patches:
    data = open(sys.argv[1], "rb").read()
    for old, new in patches.items():
        assert old in data and len(old) == len(new)
        data = data.replace(old, new)
    open(sys.argv[1], "wb").write(data)
)";

}  // namespace

bool RunTool(std::vector<std::string> words) {
  std::vector<char*> arguments;
  arguments.reserve(words.size() + 1);
  for (std::string& word : words) arguments.push_back(word.data());
  arguments.push_back(nullptr);
  pid_t child = -1;
  int status = -1;
  return ::posix_spawnp(&child, arguments[0], nullptr, nullptr, arguments.data(), environ) == 0 &&
         ::waitpid(child, &status, 0) == child && status == 0;
}

bool MakeZip(const std::string& path, const std::string& script) {
  return RunTool({"python3", "-c", kPython, path, script});
}

}  // namespace files_test
