#include "daemon/records/AuthorizationRecord.h"

#include <sodium.h>

#include <array>
#include <cstdint>
#include <string_view>
#include <utility>

#include "daemon/state/ValueText.h"

namespace records {
namespace {

struct Row {
  std::string accountType;
  std::string clientId;
  std::int64_t granted = 0;
  std::optional<std::string> permissions;
  std::optional<std::string> options;
  std::int64_t changed = 0;
  std::int64_t evidence = 0;
};

class Digest {
 public:
  Digest() { crypto_generichash_init(&state_, nullptr, 0, kSize); }

  void add(std::int64_t number) {
    std::array<unsigned char, 8> bytes;
    const auto bits = static_cast<std::uint64_t>(number);
    for (unsigned i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<unsigned char>(bits >> (8 * i));
    crypto_generichash_update(&state_, bytes.data(), bytes.size());
  }
  void add(std::string_view text) {
    add(static_cast<std::int64_t>(text.size()));
    crypto_generichash_update(&state_, reinterpret_cast<const unsigned char*>(text.data()), text.size());
  }
  void add(const std::optional<std::string>& text) {
    add(std::int64_t{text.has_value()});
    if (text) add(std::string_view(*text));
  }

  std::string finish() {
    std::string digest(kSize, '\0');
    crypto_generichash_final(&state_, reinterpret_cast<unsigned char*>(digest.data()), digest.size());
    return digest;
  }

 private:
  static constexpr std::size_t kSize = crypto_generichash_BYTES_MIN;
  crypto_generichash_state state_;
};

// SQLite checks how a file hangs together, not what it says: a single bit makes a grant of a refusal.
std::string digestOf(const Row& row) {
  Digest digest;
  digest.add(std::string_view(row.accountType));
  digest.add(std::string_view(row.clientId));
  digest.add(row.granted);
  digest.add(row.permissions);
  digest.add(row.options);
  digest.add(row.changed);
  // Rows from before evidence was kept have a digest without it.
  if (row.evidence != 0) digest.add(row.evidence);
  return digest.finish();
}

std::optional<std::string> textOf(const std::optional<RVPermissionSet>& permissions) {
  if (!permissions) return std::nullopt;
  return state::textFromValue(RVArray(permissions->begin(), permissions->end()));
}

std::optional<std::string> textOf(const std::optional<RVDictionary>& options) {
  if (!options) return std::nullopt;
  return state::textFromValue(*options);
}

std::optional<RVPermissionSet> permissionsFrom(std::string_view text) {
  const auto value = state::valueFromText(text);
  if (!value || value->array() == nullptr) return std::nullopt;
  RVPermissionSet permissions;
  for (const RVValue& element : *value->array()) {
    if (element.string() == nullptr) return std::nullopt;
    permissions.insert(*element.string());
  }
  return permissions;
}

std::optional<RVDictionary> optionsFrom(std::string_view text) {
  const auto value = state::valueFromText(text);
  if (!value || value->dictionary() == nullptr) return std::nullopt;
  return *value->dictionary();
}

}  // namespace

base::Result<AuthorizationRecord> readAuthorization(const Statement& row) {
  const Row read{row.text(0),
                 row.text(1),
                 row.number(2),
                 row.optionalText(3),
                 row.optionalText(4),
                 row.number(5),
                 row.number(6)};
  if (digestOf(read) != row.blob(7))
    return base::Failure{base::FailureKind::kDamaged, "its digest does not fit"};
  AuthorizationRecord record{read.accountType,
                             read.clientId,
                             read.granted != 0,
                             std::nullopt,
                             std::nullopt,
                             std::chrono::sys_seconds(std::chrono::seconds(read.changed)),
                             static_cast<clients::Evidence>(read.evidence)};
  if (read.permissions) record.permissions = permissionsFrom(*read.permissions);
  if (read.options) record.options = optionsFrom(*read.options);
  if (record.permissions.has_value() != read.permissions.has_value() ||
      record.options.has_value() != read.options.has_value())
    return base::Failure{base::FailureKind::kDamaged, "what it holds is no value"};
  return record;
}

base::Result<void> writeAuthorization(Connection& connection, const AuthorizationRecord& record) {
  const Row row{record.accountType,
                record.clientId,
                record.granted ? 1 : 0,
                textOf(record.permissions),
                textOf(record.options),
                record.changed.time_since_epoch().count(),
                static_cast<std::int64_t>(record.evidence)};
  return connection.run(
      "INSERT OR REPLACE INTO authorizations (account_type, client_id, granted, permissions,"
      " options, changed, evidence, digest) VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8)",
      row.accountType,
      row.clientId,
      row.granted,
      row.permissions,
      row.options,
      row.changed,
      row.evidence,
      Blob{digestOf(row)});
}

}  // namespace records
