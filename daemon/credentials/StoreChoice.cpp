#include "daemon/credentials/StoreChoice.h"

#include <optional>
#include <utility>

#include "daemon/credentials/Keychain.h"
#include "daemon/log/Log.h"

namespace credentials {
namespace {

using base::Failure;
using base::FailureKind;
using base::Result;
using records::Connection;

Result<void> note(records::Database& database, const StoreChoice& choice) {
  return database.write([&](Connection& connection) {
    return connection.run("UPDATE credential_store SET store = ?1, leftovers = ?2",
                          static_cast<std::int64_t>(choice.store),
                          std::int64_t{choice.hasLeftovers});
  });
}

const char* nameOf(StoreKind kind) {
  return kind == StoreKind::kSealed ? "rvd's own database" : "the desktop's keyring";
}

const char* settingOf(StoreKind kind) {
  return kind == StoreKind::kSealed ? "sealed" : "secret-service";
}

Result<void> removeAll(CredentialStore& store) {
  const auto places = store.places();
  if (!places) return places.failure();
  for (const Place& place : *places)
    if (auto removed = store.remove(place); !removed) return removed;
  return {};
}

// The failure of a step with one credential, which it names.
Failure failureOf(const Place& place, const char* what, const std::string& why) {
  return {FailureKind::kFailed,
          "the credential of account " + place.accountId +
              (place.clientId ? ", of the client " + *place.clientId + ", " : std::string(", of its own, ")) +
              what + ": " + why};
}

Result<void> copy(const Place& place, CredentialStore& from, CredentialStore& to) {
  const auto credential = from.read(place);
  if (!credential) return failureOf(place, "cannot be read", credential.failure().message);
  if (!*credential) return failureOf(place, "cannot be read", "it is not there any more");
  if (auto written = to.write(place, **credential); !written)
    return failureOf(place, "cannot be stored", written.failure().message);
  const auto copied = to.read(place);
  if (!copied) return failureOf(place, "cannot be read back", copied.failure().message);
  if (*copied != *credential) return failureOf(place, "cannot be read back", "it is another one");
  return {};
}

// Everything is in both stores then, and `choice` says that there are leftovers.
Result<void> copyAll(CredentialStore& from,
                     CredentialStore& to,
                     records::Database& database,
                     StoreChoice& choice) {
  const auto places = from.places();
  if (!places) return places.failure();
  if (places->empty() && !choice.hasLeftovers) return {};
  choice.hasLeftovers = true;
  if (auto noted = note(database, choice); !noted) return noted;
  if (auto removed = removeAll(to); !removed) return removed;
  for (const Place& place : *places) {
    auto copied = copy(place, from, to);
    if (copied) continue;
    // The copies go at once where they can, else with the next start.
    if (removeAll(to)) {
      choice.hasLeftovers = false;
      (void)note(database, choice);
    }
    return copied;
  }
  return {};
}

Result<void> move(StoreKind wanted,
                  CredentialStore& store,
                  CredentialStore& other,
                  records::Database& database,
                  StoreChoice& choice,
                  RVLogService& log) {
  // What nobody may read is not moved.
  if (auto done = Keychain(database, other, log).reconcile(); !done) return done;
  if (auto copied = copyAll(other, store, database, choice); !copied) return copied;
  StoreChoice moved = choice;
  moved.store = wanted;
  if (auto noted = note(database, moved); !noted) return noted;
  logging::notice(log, "The credentials were moved from %@ to %@.", {nameOf(choice.store), nameOf(wanted)});
  choice = moved;
  return {};
}

}  // namespace

Result<StoreChoice> StoreChoice::read(records::Database& database) {
  StoreChoice choice;
  const auto done = database.read([&](Connection& connection) -> Result<void> {
    auto statement = connection.prepare("SELECT store, leftovers, name FROM credential_store");
    if (!statement) return statement.failure();
    const auto row = (*statement)->step();
    if (!row) return row.failure();
    if (!*row) return Failure{FailureKind::kDamaged, "the database does not say where its credentials are"};
    choice = {
        static_cast<StoreKind>((*statement)->number(0)), (*statement)->number(1) != 0, (*statement)->text(2)};
    return {};
  });
  if (!done) return done.failure();
  return choice;
}

Result<void> keepCredentialsIn(StoreKind wanted,
                               CredentialStore& store,
                               CredentialStore* other,
                               records::Database& database,
                               StoreChoice choice,
                               RVLogService& log) {
  if (choice.store == StoreKind::kNone) {
    choice.store = wanted;
    if (auto noted = note(database, choice); !noted) return noted;
  }
  if (choice.store != wanted) {
    const StoreKind before = choice.store;
    if (const auto moved = move(wanted, store, *other, database, choice, log); !moved)
      return Failure{FailureKind::kRefused,
                     std::string("The credentials cannot be moved from ") + nameOf(before) + " to " +
                         nameOf(wanted) + ": " + moved.failure().message +
                         ". Mend that and start rvd again, or set Store=" + settingOf(before) +
                         " again, where they still are"};
  }
  if (!choice.hasLeftovers) return {};
  auto cleared = removeAll(*other);
  choice.hasLeftovers = false;
  if (cleared) cleared = note(database, choice);
  if (!cleared)
    logging::error(log,
                   "Copies of credentials are left in %@ until rvd starts again: %@",
                   {nameOf(wanted == StoreKind::kSealed ? StoreKind::kSecretService : StoreKind::kSealed),
                    RVValue(cleared.failure().message)});
  return {};
}

}  // namespace credentials
