// SPDX-License-Identifier: Apache-2.0
//
// One thread, no lock.
#include "Tools/handset/NetworkQuestions.h"

#include <memory>
#include <optional>
#include <string>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Json.h"
#include "Tools/handset/ListAnswer.h"
#include "Tools/handset/Options.h"

namespace handset {
namespace {

using Words = Control::Words;

/// The one word that is expected.
const std::string& OnlyWord(const Words& words, const std::string& what) {
  if (words.size() != 1) RefuseUsage("needs exactly " + what);
  return words.front();
}

std::string CountersLine(const Link& link, const Counters& counters) {
  return std::string(link.name) + "  rx " + std::to_string(counters.receivedPackets) + " packets " +
         std::to_string(counters.receivedBytes) + " bytes, tx " +
         std::to_string(counters.sentPackets) + " packets " + std::to_string(counters.sentBytes) +
         " bytes\n";
}

std::string CountersJson(const Link& link, const Counters& counters) {
  return "{\"interface\":" + JsonString(link.name) +
         ",\"rx_packets\":" + std::to_string(counters.receivedPackets) +
         ",\"rx_bytes\":" + std::to_string(counters.receivedBytes) +
         ",\"tx_packets\":" + std::to_string(counters.sentPackets) +
         ",\"tx_bytes\":" + std::to_string(counters.sentBytes) + "}\n";
}

void AnswerCounters(Question& question, const Words& words, const Links& links) {
  bool isJson = false;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option != "--json") RefuseUsage("unknown option " + *option);
    isJson = true;
  }
  const Words names = reader.rest();
  for (const Link& link : AllLinks()) {
    const bool isAsked =
        names.empty() ? links.isThere(link) : RequireLink(names[0]).name == link.name;
    if (!isAsked) continue;
    const Counters counters = links.counters(link);
    question.say(isJson ? CountersJson(link, counters) : CountersLine(link, counters));
  }
  question.finish();
}

void ChangeLink(const std::string& verb, const Link& link, Links& links, Capture& capture) {
  if (verb == "down") {
    links.down(link);
  } else if (verb == "up") {
    links.up(link);
  } else if (verb == "remove") {
    capture.suspend(link);
    links.remove(link);
  } else if (verb == "add") {
    links.add(link);
    capture.resume(link);
  } else {
    RefuseUsage("unknown command network " + verb);
  }
}

void AnswerNetwork(Question& question, const Words& words, Links& links, Capture& capture) {
  if (words.empty()) RefuseUsage("network needs a command");
  const Words rest(words.begin() + 1, words.end());
  if (words.front() == "counters") {
    AnswerCounters(question, rest, links);
    return;
  }
  ChangeLink(words.front(), RequireLink(OnlyWord(rest, "one interface")), links, capture);
  question.finish();
}

/// Positions of the packets of one protocol and one link; an empty text stands for any.
class Selection {
 public:
  Selection(const Capture& capture, std::string protocol, std::string link)
      : capture_(capture), protocol_(std::move(protocol)), link_(std::move(link)) {}

  /// The packet number `index` of the selection; null where there is none yet.
  [[nodiscard]] const Packet* at(std::size_t index) {
    const std::vector<Packet>& packets = capture_.packets();
    for (; looked_ < packets.size(); ++looked_) {
      if (isSelected(packets[looked_])) positions_.push_back(looked_);
    }
    return index < positions_.size() ? &packets[positions_[index]] : nullptr;
  }

 private:
  [[nodiscard]] bool isSelected(const Packet& packet) const {
    return (protocol_.empty() || ProtocolOf(packet) == protocol_) &&
           (link_.empty() || packet.link == link_);
  }

  const Capture& capture_;
  std::string protocol_;
  std::string link_;
  std::vector<std::size_t> positions_;
  std::size_t looked_ = 0;
};

void ShowCapture(Question& question, const Words& words, Capture& capture) {
  ListOptions list;
  bool isJson = false;
  std::string protocol;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--json") {
      isJson = true;
    } else if (*option == "--protocol") {
      protocol = reader.value();
    } else if (!list.take(*option, reader)) {
      RefuseUsage("unknown option " + *option);
    }
  }
  const Words names = reader.rest();
  const std::string link = names.empty() ? "" : RequireLink(OnlyWord(names, "one interface")).name;
  if (capture.lost() > 0) {
    question.complain(std::to_string(capture.lost()) + " packets came too fast and are not here");
  }
  const auto selection = std::make_shared<Selection>(capture, protocol, link);
  AnswerWithList(question, list,
                 [selection, isJson](std::size_t index) -> std::optional<std::string> {
                   const Packet* packet = selection->at(index);
                   if (packet == nullptr) return std::nullopt;
                   return isJson ? PacketJson(*packet) : PacketLine(*packet);
                 });
}

void AnswerCapture(Question& question, const Words& words, Capture& capture) {
  if (words.empty()) RefuseUsage("capture needs a command");
  const Words rest(words.begin() + 1, words.end());
  if (words.front() == "show") {
    ShowCapture(question, rest, capture);
  } else if (words.front() == "start") {
    capture.start(RequireLink(OnlyWord(rest, "one interface")));
    question.finish();
  } else {
    RefuseUsage("unknown command capture " + words.front());
  }
}

void AnswerTower(Question& question, const Words& words, const Links& links,
                 const Capture& capture) {
  if (words.size() != 2) RefuseUsage("tower needs a command and one argument");
  const std::string& verb = words[0];
  const std::string& what = words[1];
  if (verb == "reply" && (what == "on" || what == "off")) {
    links.setEchoReplies(what == "on");
  } else if (verb == "send") {
    capture.inject(AllLinks().front(), BytesOfHex(what));
  } else {
    RefuseUsage("unknown command tower " + verb + " " + what);
  }
  question.finish();
}

}  // namespace

void AnswerAboutNetwork(Control& control, Links& links, Capture& capture) {
  control.on("network", [&](Question& question, const Words& words) {
    AnswerNetwork(question, words, links, capture);
  });
  control.on("capture", [&capture](Question& question, const Words& words) {
    AnswerCapture(question, words, capture);
  });
  control.on("tower", [&](Question& question, const Words& words) {
    AnswerTower(question, words, links, capture);
  });
}

}  // namespace handset
