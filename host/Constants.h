// The names that the daemon, its plug-ins and its clients agree on, and their values.
//
// Everything here is compared by value. The values are part of the bus interfaces, of the stored
// records and of the settings files, so changing one changes what is already on users' disks.
#pragma once

#include <string_view>

// Account types.
inline constexpr std::string_view RVAccountTypeIdentifierFacebook = "com.zentor.facebook";

// Keys of a Facebook access request's options, and the values of the audience.
inline constexpr std::string_view RVFacebookAppIdKey = "app_id";
inline constexpr std::string_view RVFacebookPermissionsKey = "permissions";
inline constexpr std::string_view RVFacebookAudienceKey = "audience";
inline constexpr std::string_view RVFacebookAudienceEveryone = "everyone";
inline constexpr std::string_view RVFacebookAudienceFriends = "friends";
inline constexpr std::string_view RVFacebookAudienceOnlyMe = "only_me";

// Errors of access decisions. The other domains are those of the host's own services.
inline constexpr std::string_view RVErrorDomain = "com.zentor.accounts";
inline constexpr std::string_view kRVTransferErrorDomain = "com.zentor.transfer";
inline constexpr std::string_view kRVJSONErrorDomain = "com.zentor.json";
inline constexpr int kRVErrorNoAccount = 6;               // no account of the type is set up
inline constexpr int kRVErrorPermissionDenied = 7;        // the user or the server refused
inline constexpr int kRVErrorInvalidOptions = 8;          // the options dictionary is unusable
inline constexpr int kRVErrorClientWithoutBundleID = 16;  // the client has no bundle identifier

// The user-info entry that holds an error's text.
inline constexpr std::string_view kRVErrorLocalizedDescriptionKey = "description";

// Entitlements of a client.
inline constexpr std::string_view kRVDAllAccountsAccessEntitlement = "com.zentor.accounts.all-access";
inline constexpr std::string_view kRVDFacebookAccountsDefaultAccessEntitlement =
    "com.zentor.accounts.facebook.default-access";

// Preferences.
inline constexpr std::string_view TKFacebookPreferencesAppID = "com.zentor.tessel.facebook";
inline constexpr std::string_view TKFacebookIgnoreAccessRequests = "TKFacebookIgnoreAccessRequests";
inline constexpr std::string_view TKFacebookEnvironmentDidChangeNotification =
    "TKFacebookEnvironmentDidChangeNotification";

// Keys of an alert's description.
inline constexpr std::string_view kZQUserNotificationAlertHeaderKey = "header";
inline constexpr std::string_view kZQUserNotificationAlertMessageKey = "message";
inline constexpr std::string_view kZQUserNotificationAlternateButtonTitleKey = "alternate_button_title";
inline constexpr std::string_view kZQUserNotificationDefaultButtonTitleKey = "default_button_title";
inline constexpr std::string_view kZQUserNotificationAlertTopMostKey = "top_most";
inline constexpr std::string_view MWUserNotificationDismissOnLock = "dismiss_on_lock";
inline constexpr std::string_view MWUserNotificationDontDismissOnUnlock = "dont_dismiss_on_unlock";

// The log's facility and levels; the levels are the journal's priorities.
inline constexpr std::string_view kRVLogFacilityDaemon = "daemon";
inline constexpr int kRVLogLevelError = 3;
inline constexpr int kRVLogLevelNotice = 5;
inline constexpr int kRVLogLevelDebug = 7;

// What a format shows where its argument is absent.
inline constexpr std::string_view kRVAbsentValueText = "(null)";
