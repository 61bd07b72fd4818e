// SPDX-License-Identifier: Apache-2.0
//
// The 23 requests of a private port, one line each, in id order. Server stubs, client calls and the
// command line are all derived from these rows.
#pragma once

#include "Helper/Shared/Interface/Request.h"

// clang-format off
namespace requests {

using wire::Arg, wire::Flag, wire::In, wire::Integer, wire::Mask, wire::Out, wire::OutOfLine, wire::Real, wire::Request, wire::Text;

using SetVoicemailToken                 = Request<8683549, "SetVoicemailToken",                 In<Arg<"token", Text<256>>>, Out<>>;
using SetVoicemailTokenForKey           = Request<8683550, "SetVoicemailTokenForKey",           In<Arg<"key", Text<256>>, Arg<"token", Text<256>>>, Out<>>;
using ClearVoicemailToken               = Request<8683551, "ClearVoicemailToken",               In<>, Out<>>;
using ResetVoicemailRecords             = Request<8683552, "ResetVoicemailRecords",             In<>, Out<>>;
using CopyVoicemailTokenForKey          = Request<8683553, "CopyVoicemailTokenForKey",          In<Arg<"key", Text<256>>>, Out<Arg<"token", Text<256>>>>;
using CopyVoicemailToken                = Request<8683554, "CopyVoicemailToken",                In<>, Out<Arg<"token", Text<256>>>>;
using SetPreferenceValue                = Request<8683555, "SetPreferenceValue",                In<Arg<"domain", Text<256>>, Arg<"key", Text<256>>, Arg<"value", OutOfLine>>, Out<>>;
using CopyPreferenceValue               = Request<8683556, "CopyPreferenceValue",               In<Arg<"domain", Text<256>>, Arg<"key", Text<256>>>, Out<Arg<"value", OutOfLine>>>;
using CopyAppPreferenceValue            = Request<8683557, "CopyAppPreferenceValue",            In<Arg<"domain", Text<256>>, Arg<"key", Text<256>>>, Out<Arg<"value", OutOfLine>>>;
using SetCarrierBundleLink              = Request<8683558, "SetCarrierBundleLink",              In<Arg<"target", Text<1024>>, Arg<"link-path", Text<1024>>, Arg<"domain", Text<1024>>>, Out<>>;
using CreateSymlink                     = Request<8683559, "CreateSymlink",                     In<Arg<"target", Text<1024>>, Arg<"link-path", Text<1024>>>, Out<>>;
using RemoveCarrierBundleLink           = Request<8683560, "RemoveCarrierBundleLink",           In<Arg<"link-path", Text<1024>>, Arg<"domain", Text<1024>>>, Out<>>;
using IsVoicemailSubscribed             = Request<8683561, "IsVoicemailSubscribed",             In<>, Out<Arg<"subscribed", Flag>>>;
using TriggerHeartbeat                  = Request<8683562, "TriggerHeartbeat",                  In<Arg<"enable", Integer>>, Out<>>;
using TriggerDatabaseUpdate             = Request<8683563, "TriggerDatabaseUpdate",             In<Arg<"types", Mask>>, Out<>>;
using CopyFile                          = Request<8683564, "CopyFile",                          In<Arg<"source-directory", Text<256>>, Arg<"destination-directory", Text<256>>, Arg<"file-name", Text<256>>>, Out<Arg<"success", Flag>>>;
using CopyCrashLogs                     = Request<8683565, "CopyCrashLogs",                     In<Arg<"source-path", Text<256>>>, Out<Arg<"success", Flag>>>;
using MoveCarrierBundles                = Request<8683566, "MoveCarrierBundles",                In<Arg<"source-path", Text<256>>, Arg<"destination-directory", Text<256>>, Arg<"name", Text<256>>>, Out<Arg<"success", Flag>>>;
using RequestCountryCodeFromLocation    = Request<8683567, "RequestCountryCodeFromLocation",    In<Arg<"latitude", Real>, Arg<"longitude", Real>>, Out<>>;
using CopyCountryCode                   = Request<8683568, "CopyCountryCode",                   In<>, Out<Arg<"country-code", Text<64>>>>;
using SetRadioManagerLogging            = Request<8683569, "SetRadioManagerLogging",            In<Arg<"enable", Integer>>, Out<>>;
using ExtractArchive                    = Request<8683570, "ExtractArchive",                    In<Arg<"source-path", Text<256>>, Arg<"destination-path", Text<256>>>, Out<Arg<"success", Flag>>>;
using CopyPropertyListFile              = Request<8683571, "CopyPropertyListFile",              In<Arg<"path", Text<256>>>, Out<Arg<"content", OutOfLine>>>;

/// Every row, in id order.
using All = std::tuple<
    SetVoicemailToken, SetVoicemailTokenForKey, ClearVoicemailToken, ResetVoicemailRecords, CopyVoicemailTokenForKey,
    CopyVoicemailToken, SetPreferenceValue, CopyPreferenceValue, CopyAppPreferenceValue, SetCarrierBundleLink,
    CreateSymlink, RemoveCarrierBundleLink, IsVoicemailSubscribed, TriggerHeartbeat, TriggerDatabaseUpdate,
    CopyFile, CopyCrashLogs, MoveCarrierBundles, RequestCountryCodeFromLocation, CopyCountryCode,
    SetRadioManagerLogging, ExtractArchive, CopyPropertyListFile>;

inline constexpr std::int32_t kFirstId = 8683549;
inline constexpr std::int32_t kEndId = 8683572;

}  // namespace requests
