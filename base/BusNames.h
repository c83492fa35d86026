// The names under which programs find the daemon on the bus, and those of the errors that it answers with.
#pragma once

namespace base {

inline constexpr const char* kServiceName = "com.zentor.rvd";
inline constexpr const char* kObjectPath = "/com/zentor/rvd";

inline constexpr const char* kAccessDenied = "org.freedesktop.DBus.Error.AccessDenied";
inline constexpr const char* kInvalidArgs = "org.freedesktop.DBus.Error.InvalidArgs";
inline constexpr const char* kUnsupportedAccountType = "com.zentor.rvd.Error.UnsupportedAccountType";
inline constexpr const char* kUnknownApplication = "com.zentor.rvd.Error.UnknownApplication";
inline constexpr const char* kAlreadyIdentified = "com.zentor.rvd.Error.AlreadyIdentified";
inline constexpr const char* kNoAccess = "com.zentor.rvd.Error.NoAccess";
inline constexpr const char* kLimitsExceeded = "com.zentor.rvd.Error.LimitsExceeded";
inline constexpr const char* kFailed = "com.zentor.rvd.Error.Failed";

}  // namespace base
