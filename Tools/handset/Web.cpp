// SPDX-License-Identifier: Apache-2.0
//
// One thread, no lock.
#include "Tools/handset/Web.h"

#include <sys/mount.h>

#include <optional>
#include <utility>

#include "Tools/handset/Certificates.h"
#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Links.h"
#include "Tools/handset/ListAnswer.h"
#include "Tools/handset/Options.h"

namespace handset {
namespace {

using Words = Control::Words;

constexpr const char* kResolverFile = "/etc/resolv.conf";

/// Every link's far side serves names; the handset asks the Wi-Fi one.
std::vector<std::string> NameServers() {
  std::vector<std::string> addresses;
  for (const Link& link : AllLinks()) addresses.emplace_back(link.farAddress);
  return addresses;
}

void ResolveInTheWorld() {
  // Some hosts mount a file of theirs there.
  umount2(kResolverFile, MNT_DETACH);
  ReplaceFile(kResolverFile, "nameserver " + NameServers().back() + "\n", 0644);
}

void AnswerLog(Question& question, const Words& words, const WebServer& server) {
  ListOptions list;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (!list.take(*option, reader)) RefuseUsage("unknown option " + *option);
  }
  AnswerWithList(question, list, [&server](std::size_t index) -> std::optional<std::string> {
    if (index >= server.log().size()) return std::nullopt;
    return server.log()[index];
  });
}

}  // namespace

Web::Web(EventLoop& loop, const World& world, const std::vector<std::string>& hosts,
         std::function<void()> changed)
    : names_(loop, world, NameServers(), hosts, kWorldAddress), server_(loop, world) {
  MakeCertificates(hosts);
  ResolveInTheWorld();
  server_.onRequest(std::move(changed));
  server_.start();
}

void Web::drain() {
  names_.drain();
  server_.drain();
}

void Web::answerQuestions(Control& control) {
  control.on("web", [this](Question& question, const Words& words) { answer(question, words); });
}

void Web::answer(Question& question, const Words& words) {
  if (words.empty()) RefuseUsage("web needs a command");
  const Words rest(words.begin() + 1, words.end());
  if (words.front() == "log") {
    AnswerLog(question, rest, server_);
    return;
  }
  if (words == Words{"start"}) {
    server_.start();
  } else if (words == Words{"stop"}) {
    server_.stop();
  } else if (words == Words{"dns", "on"} || words == Words{"dns", "off"}) {
    names_.setAnswering(rest.front() == "on");
  } else {
    RefuseUsage("unknown command web " + words.front());
  }
  question.finish();
}

}  // namespace handset
