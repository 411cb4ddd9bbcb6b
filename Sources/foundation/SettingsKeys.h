#pragma once

#include <QLatin1StringView>

// The names under which UserDefaults keeps the user's settings. They are the settings file's keys, so
// renaming one loses what users stored under it.
namespace SettingsKeys {

// Idle detection: whether it is on, and after how many minutes (registered as 5).
inline constexpr QLatin1StringView kShouldIdle{"WTShouldIdle"};
inline constexpr QLatin1StringView kIdleTime{"WTIdleTime"};
// Starting a timer stops every other running timer.
inline constexpr QLatin1StringView kStopsOtherTimes{"WTStopsOtherTimes"};
// The top of rate inheritance, above the built-in rates (a decimal).
inline constexpr QLatin1StringView kDefaultRate{"WTDefaultRate"};
// What is billed where a client names no currency of its own: an ISO 4217 code (registered as the
// locale's currency).
inline constexpr QLatin1StringView kCurrency{"WTCurrency"};
// The rounding rule at the top of its inheritance (client, project and task may each set their own):
// time entries are billed in multiples of kRoundingMinutes (registered as 1, no rounding), rounded by
// kRoundingMode: "up", "nearest" (a half up; registered) or "down".
inline constexpr QLatin1StringView kRoundingMinutes{"WTRoundingMinutes"};
inline constexpr QLatin1StringView kRoundingMode{"WTRoundingMode"};
// Registered as "h" at start; nothing reads it.
inline constexpr QLatin1StringView kInvoiceUnit{"wtInvoiceUnit"};
// The user's own details for the head of a report (Preferences › Billing): texts, the address on
// several lines.
inline constexpr QLatin1StringView kBillingName{"WTBillingName"};
inline constexpr QLatin1StringView kBillingAddress{"WTBillingAddress"};
inline constexpr QLatin1StringView kBillingTaxNumber{"WTBillingTaxNumber"};
inline constexpr QLatin1StringView kBillingPaymentTerms{"WTBillingPaymentTerms"};

// The report's custom range (registered as the last month) and the range sheet's own pair.
inline constexpr QLatin1StringView kCustomRangeBegin{"WTCustomRangeBegin"};
inline constexpr QLatin1StringView kCustomRangeEnd{"WTCustomRangeEnd"};
inline constexpr QLatin1StringView kCustomRangeWindowBegin{"WTCustomRangeWindowBegin"};
inline constexpr QLatin1StringView kCustomRangeWindowEnd{"WTCustomRangeWindowEnd"};
// The export's last choices, offered again: the range's tag (WTRangePredicate::Tag) and the format.
inline constexpr QLatin1StringView kExportRange{"WTExportRange"};
inline constexpr QLatin1StringView kExportFormat{"WTExportFormat"};

// The main window: the project chosen last and the window's place and size.
inline constexpr QLatin1StringView kLastSelectedProject{"WTLastSelectedProject"};
inline constexpr QLatin1StringView kMainWindowGeometry{"WTMainWindowGeometry"};
// Followed by an outline's autosave name: the groups left expanded in it.
inline constexpr QLatin1StringView kExpandedItemsPrefix{"NSOutlineView Items "};

// The sync account and server, and this installation's device identity.
inline constexpr QLatin1StringView kSyncUser{"WTSyncUser"};
inline constexpr QLatin1StringView kSyncServer{"WTSyncServer"};
inline constexpr QLatin1StringView kSyncDevice{"WTSyncDevice"};
// The machine the identity was made on (a hash of its machine id), to tell settings copied to another.
inline constexpr QLatin1StringView kSyncDeviceMachine{"WTSyncDeviceMachine"};
// The password, only where no secret service took it.
inline constexpr QLatin1StringView kSyncPassword{"WTSyncPassword"};
// Set when the keychain refused the password, cancelled its prompt or did not answer in time: the
// password then stays in the settings file and later starts do not ask again (no prompt at every
// start). Storing a password anew asks again.
inline constexpr QLatin1StringView kSyncPasswordKeptInFile{"WTSyncPasswordKeptInFile"};

}  // namespace SettingsKeys
