// SPDX-License-Identifier: Apache-2.0
#include "Helper/Shared/Server/Observation.h"

#include <unistd.h>

#include <bit>
#include <chrono>
#include <string_view>
#include <tuple>
#include <utility>

#include "Helper/Platform/CurrentWork.h"
#include "Helper/Platform/PropertyList.h"
#include "Helper/Shared/Interface/Connect.h"
#include "Helper/Shared/Interface/Requests.h"
#include "Helper/Shared/Server/HelperServerUtils.h"

namespace {

using platform::PropertyList;

/// What fits into one packet with room to spare; the number of clients is told in any case.
constexpr std::size_t kMaxListedClients = 256;

template <class... Rows>
std::string_view NameAmong(std::int32_t id, const std::tuple<Rows...>*) {
  std::string_view name = "unknown";
  ((Rows::kId == id ? void(name = Rows::kName) : void()), ...);
  return name;
}

std::string_view NameOfMessage(std::int32_t id) {
  if (id == wire::kConnectId) return "connect";
  return NameAmong(id, static_cast<const requests::All*>(nullptr));
}

double Seconds(platform::Duration duration) {
  return std::chrono::duration<double>(duration).count();
}

/// Where the thread that takes a token stands: in a request, or in the work of a queue.
std::string OwnerOfWork() {
  const platform::CurrentWork& work = platform::WorkOfThisThread();
  if (work.requestId != 0) return std::string(NameOfMessage(work.requestId));
  return work.queue ? work.queue : "main thread";
}

PropertyList::Date Now() {
  using namespace std::chrono;
  constexpr sys_days kEpoch = 2001y / January / 1;
  return {duration<double>(system_clock::now() - kEpoch).count()};
}

std::vector<std::byte> Packet(PropertyList::Dictionary dictionary) {
  return platform::SerializeBinary(std::move(dictionary)).value_or(std::vector<std::byte>());
}

}  // namespace

std::unique_ptr<Observation> Observation::Open(HelperServer& server, const std::string& path) {
  platform::RunLoop& loop = platform::RunLoop::Current();
  std::unique_ptr<Observation> observation(new Observation(server, loop));
  Observation* self = observation.get();
  observation->channel_ =
      platform::ObserverChannel::Open(loop, path, [self] { return self->snapshot(); });
  if (!observation->channel_) return nullptr;
  platform::SetServedMessageHook([self](const auto& message) { self->noteServed(message); });
  return observation;
}

Observation::~Observation() { platform::SetServedMessageHook(nullptr); }

void Observation::noteClient(PortName privatePort, const wire::AuditToken& client) {
  clients_[privatePort] = {.process = client.words[wire::kAuditProcess],
                           .user = client.words[wire::kAuditUser],
                           .since = loop_.now()};
}

void Observation::forgetClient(PortName privatePort) { clients_.erase(privatePort); }

void Observation::noteWorkToken(std::uint32_t token) {
  WorkToken& entry = workTokens_[static_cast<std::size_t>(std::countr_zero(token))];
  if (entry.owner.empty()) entry = {.owner = OwnerOfWork(), .since = loop_.now()};
}

void Observation::forgetWorkToken(std::uint32_t token) {
  workTokens_[static_cast<std::size_t>(std::countr_zero(token))].owner.clear();
}

void Observation::noteServed(const platform::ServedMessage& message) {
  {
    const std::lock_guard guard(server_.lock);
    if (const auto client = clients_.find(message.port); client != clients_.end()) {
      ++client->second.requests;
      client->second.lastRequest = message.id;
      client->second.lastCode = message.code;
    }
  }
  if (!channel_->isObserved()) return;
  PropertyList::Dictionary event;
  event.insert("Time", Now());
  event.insert("Request", NameOfMessage(message.id));
  event.insert("Id", message.id);
  event.insert("Process", message.sender.words[wire::kAuditProcess]);
  event.insert("User", message.sender.words[wire::kAuditUser]);
  event.insert("Code", message.code);
  event.insert("Microseconds",
               std::chrono::duration_cast<std::chrono::microseconds>(message.took).count());
  channel_->publish(Packet(std::move(event)));
}

std::vector<std::byte> Observation::snapshot() const {
  const platform::TimePoint now = loop_.now();
  const std::lock_guard guard(server_.lock);
  PropertyList::Array clients;
  for (const auto& [port, client] : clients_) {
    if (clients.size() == kMaxListedClients) break;
    PropertyList::Dictionary entry;
    entry.insert("Process", client.process);
    entry.insert("User", client.user);
    entry.insert("ConnectedSeconds", Seconds(now - client.since));
    entry.insert("Requests", client.requests);
    if (client.requests > 0) {
      entry.insert("LastRequest", NameOfMessage(client.lastRequest));
      entry.insert("LastCode", client.lastCode);
    }
    clients.emplace_back(std::move(entry));
  }
  PropertyList::Array tokens;
  for (std::size_t bit = 0; bit < workTokens_.size(); ++bit) {
    if (workTokens_[bit].owner.empty()) continue;
    PropertyList::Dictionary entry;
    entry.insert("Token", std::uint32_t{1} << bit);
    entry.insert("Owner", workTokens_[bit].owner);
    entry.insert("AgeSeconds", Seconds(now - workTokens_[bit].since));
    tokens.emplace_back(std::move(entry));
  }
  PropertyList::Dictionary status;
  status.insert("Process", ::getpid());
  status.insert("ClientCount", clients_.size());
  status.insert("Clients", std::move(clients));
  status.insert("WorkTokens", std::move(tokens));
  if (server_.idleTimer) {
    status.insert("IdleExitInSeconds", Seconds(server_.idleTimer->fireDate() - now));
  }
  return Packet(std::move(status));
}
