// SPDX-License-Identifier: Apache-2.0
//
// The C functions of the 23 requests, one line of work each: the row gives arguments and result.
#include <cstddef>
#include <cstdlib>
#include <tuple>
#include <type_traits>
#include <utility>

#include "Client/CInterface.h"

namespace halvec {
namespace {

/// Hands a result text to the caller as new memory.
Error HandOver(const std::string& text, char** out) {
  auto* copy = static_cast<char*>(std::malloc(text.size() + 1));
  if (copy == nullptr) return {HVMH_NO_MEMORY};
  std::memcpy(copy, text.c_str(), text.size() + 1);
  *out = copy;
  return {};
}

Error HandOver(bool flag, bool* out) {
  *out = flag;
  return {};
}

/// A place for data that is returned: two pointers of the C caller.
struct DataPlace {
  void** bytes;
  std::size_t* size;
};

/// Clears a place for a result; false when the caller gave none.
bool Clear(char** out) {
  if (out != nullptr) *out = nullptr;
  return out != nullptr;
}
bool Clear(bool* out) {
  if (out != nullptr) *out = false;
  return out != nullptr;
}
bool Clear(const DataPlace& out) {
  if (out.bytes != nullptr) *out.bytes = nullptr;
  if (out.size != nullptr) *out.size = 0;
  return out.bytes != nullptr && out.size != nullptr;
}

Error HandOver(Data& data, const DataPlace& out) {
  *out.size = data.size();
  *out.bytes = data.release();
  return {};
}

/// Data that is sent: a pointer of the C caller, which may be null only for no bytes.
std::span<const std::byte> Bytes(const void* bytes, std::size_t size) {
  return {static_cast<const std::byte*>(bytes), size};
}

bool IsUsable(const char* text) { return text != nullptr; }
bool IsUsable(std::span<const std::byte> data) { return data.data() != nullptr || data.empty(); }
template <class Number>
requires std::is_arithmetic_v<Number>
bool IsUsable(Number) { return true; }

/// A request without a result.
template <class Row, class... Args>
hvmh_status Call(hvmh_client* client, hvmh_error* error, const Args&... arguments) noexcept {
  return Guard(error, [&]() -> Error {
    if (client == nullptr || !(... && IsUsable(arguments))) return {HVMH_INVALID_ARGUMENT};
    return client->client.call<Row>(arguments...).error();
  });
}

/// A request with a result, which goes to `out`.
template <class Row, class Out, class... Args>
hvmh_status CallFor(Out out, hvmh_client* client, hvmh_error* error,
                    const Args&... arguments) noexcept {
  return Guard(error, [&]() -> Error {
    if (!Clear(out) || client == nullptr || !(... && IsUsable(arguments))) {
      return {HVMH_INVALID_ARGUMENT};
    }
    auto result = client->client.call<Row>(arguments...);
    return result ? HandOver(*result, out) : result.error();
  });
}

}  // namespace
}  // namespace halvec

using halvec::Bytes;
using halvec::Call;
using halvec::CallFor;
using halvec::DataPlace;

hvmh_status hvmh_set_voicemail_token(hvmh_client* client, const char* token, hvmh_error* error) {
  return Call<requests::SetVoicemailToken>(client, error, token);
}

hvmh_status hvmh_set_voicemail_token_for_key(hvmh_client* client, const char* key,
                                             const char* token, hvmh_error* error) {
  return Call<requests::SetVoicemailTokenForKey>(client, error, key, token);
}

hvmh_status hvmh_clear_voicemail_token(hvmh_client* client, hvmh_error* error) {
  return Call<requests::ClearVoicemailToken>(client, error);
}

hvmh_status hvmh_reset_voicemail_records(hvmh_client* client, hvmh_error* error) {
  return Call<requests::ResetVoicemailRecords>(client, error);
}

hvmh_status hvmh_copy_voicemail_token_for_key(hvmh_client* client, const char* key, char** token,
                                              hvmh_error* error) {
  return CallFor<requests::CopyVoicemailTokenForKey>(token, client, error, key);
}

hvmh_status hvmh_copy_voicemail_token(hvmh_client* client, char** token, hvmh_error* error) {
  return CallFor<requests::CopyVoicemailToken>(token, client, error);
}

hvmh_status hvmh_set_preference_value(hvmh_client* client, const char* domain, const char* key,
                                      const void* value, size_t value_size, hvmh_error* error) {
  return Call<requests::SetPreferenceValue>(client, error, domain, key, Bytes(value, value_size));
}

hvmh_status hvmh_copy_preference_value(hvmh_client* client, const char* domain, const char* key,
                                       void** value, size_t* value_size, hvmh_error* error) {
  return CallFor<requests::CopyPreferenceValue>(DataPlace{value, value_size}, client, error, domain,
                                                key);
}

hvmh_status hvmh_copy_app_preference_value(hvmh_client* client, const char* domain, const char* key,
                                           void** value, size_t* value_size, hvmh_error* error) {
  return CallFor<requests::CopyAppPreferenceValue>(DataPlace{value, value_size}, client, error,
                                                   domain, key);
}

hvmh_status hvmh_set_carrier_bundle_link(hvmh_client* client, const char* target,
                                         const char* link_path, const char* domain,
                                         hvmh_error* error) {
  return Call<requests::SetCarrierBundleLink>(client, error, target, link_path, domain);
}

hvmh_status hvmh_create_symlink(hvmh_client* client, const char* target, const char* link_path,
                                hvmh_error* error) {
  return Call<requests::CreateSymlink>(client, error, target, link_path);
}

hvmh_status hvmh_remove_carrier_bundle_link(hvmh_client* client, const char* link_path,
                                            const char* domain, hvmh_error* error) {
  return Call<requests::RemoveCarrierBundleLink>(client, error, link_path, domain);
}

hvmh_status hvmh_is_voicemail_subscribed(hvmh_client* client, bool* subscribed, hvmh_error* error) {
  return CallFor<requests::IsVoicemailSubscribed>(subscribed, client, error);
}

hvmh_status hvmh_trigger_heartbeat(hvmh_client* client, int32_t enable, hvmh_error* error) {
  return Call<requests::TriggerHeartbeat>(client, error, enable);
}

hvmh_status hvmh_trigger_database_update(hvmh_client* client, uint32_t types, hvmh_error* error) {
  return Call<requests::TriggerDatabaseUpdate>(client, error, types);
}

hvmh_status hvmh_copy_file(hvmh_client* client, const char* source_directory,
                           const char* destination_directory, const char* file_name, bool* success,
                           hvmh_error* error) {
  return CallFor<requests::CopyFile>(success, client, error, source_directory,
                                     destination_directory, file_name);
}

hvmh_status hvmh_copy_crash_logs(hvmh_client* client, const char* source_path, bool* success,
                                 hvmh_error* error) {
  return CallFor<requests::CopyCrashLogs>(success, client, error, source_path);
}

hvmh_status hvmh_move_carrier_bundles(hvmh_client* client, const char* source_path,
                                      const char* destination_directory, const char* name,
                                      bool* success, hvmh_error* error) {
  return CallFor<requests::MoveCarrierBundles>(success, client, error, source_path,
                                               destination_directory, name);
}

hvmh_status hvmh_request_country_code_from_location(hvmh_client* client, double latitude,
                                                    double longitude, hvmh_error* error) {
  return Call<requests::RequestCountryCodeFromLocation>(client, error, latitude, longitude);
}

hvmh_status hvmh_copy_country_code(hvmh_client* client, char** country_code, hvmh_error* error) {
  return CallFor<requests::CopyCountryCode>(country_code, client, error);
}

hvmh_status hvmh_set_radio_manager_logging(hvmh_client* client, int32_t enable, hvmh_error* error) {
  return Call<requests::SetRadioManagerLogging>(client, error, enable);
}

hvmh_status hvmh_extract_archive(hvmh_client* client, const char* source_path,
                                 const char* destination_path, bool* success, hvmh_error* error) {
  return CallFor<requests::ExtractArchive>(success, client, error, source_path, destination_path);
}

hvmh_status hvmh_copy_property_list_file(hvmh_client* client, const char* path, void** content,
                                         size_t* content_size, hvmh_error* error) {
  return CallFor<requests::CopyPropertyListFile>(DataPlace{content, content_size}, client, error,
                                                 path);
}

namespace halvec {
namespace {

/// The parameters by which a C caller passes one field.
template <class Field>
struct CInput;
template <std::size_t Size>
struct CInput<wire::Text<Size>> {
  using Types = std::tuple<const char*>;
};
template <>
struct CInput<wire::Integer> {
  using Types = std::tuple<std::int32_t>;
};
template <>
struct CInput<wire::Mask> {
  using Types = std::tuple<std::uint32_t>;
};
template <>
struct CInput<wire::Real> {
  using Types = std::tuple<double>;
};
template <>
struct CInput<wire::OutOfLine> {
  using Types = std::tuple<const void*, std::size_t>;
};

template <class Field>
struct COutput;
template <std::size_t Size>
struct COutput<wire::Text<Size>> {
  using Types = std::tuple<char**>;
};
template <>
struct COutput<wire::Flag> {
  using Types = std::tuple<bool*>;
};
template <>
struct COutput<wire::OutOfLine> {
  using Types = std::tuple<void**, std::size_t*>;
};

template <class Inputs, class Outputs>
struct CParameters;
template <class... Inputs, class... Outputs>
struct CParameters<std::tuple<Inputs...>, std::tuple<Outputs...>> {
  using Types = decltype(std::tuple_cat(std::declval<std::tuple<hvmh_client*>>(),
                                        std::declval<typename CInput<Inputs>::Types>()...,
                                        std::declval<typename COutput<Outputs>::Types>()...,
                                        std::declval<std::tuple<hvmh_error*>>()));
};

template <class Types>
struct CFunction;
template <class... Types>
struct CFunction<std::tuple<Types...>> {
  using Pointer = hvmh_status (*)(Types...);
};

/// Whether the functions, in the order of the rows, take and give exactly what each row says.
template <class... Rows, class... Functions>
constexpr bool MatchRows(const std::tuple<Rows...>*, Functions...) {
  static_assert(sizeof...(Rows) == sizeof...(Functions), "every request has a C function");
  return (
      ... &&
      std::is_same_v<
          Functions,
          typename CFunction<typename CParameters<typename Rows::InputFields,
                                                  typename Rows::OutputFields>::Types>::Pointer>);
}

static_assert(MatchRows(
    static_cast<const requests::All*>(nullptr), &hvmh_set_voicemail_token,
    &hvmh_set_voicemail_token_for_key, &hvmh_clear_voicemail_token, &hvmh_reset_voicemail_records,
    &hvmh_copy_voicemail_token_for_key, &hvmh_copy_voicemail_token, &hvmh_set_preference_value,
    &hvmh_copy_preference_value, &hvmh_copy_app_preference_value, &hvmh_set_carrier_bundle_link,
    &hvmh_create_symlink, &hvmh_remove_carrier_bundle_link, &hvmh_is_voicemail_subscribed,
    &hvmh_trigger_heartbeat, &hvmh_trigger_database_update, &hvmh_copy_file, &hvmh_copy_crash_logs,
    &hvmh_move_carrier_bundles, &hvmh_request_country_code_from_location, &hvmh_copy_country_code,
    &hvmh_set_radio_manager_logging, &hvmh_extract_archive, &hvmh_copy_property_list_file));

}  // namespace
}  // namespace halvec
