#include "daemon/credentials/SecretServiceStore.h"

#include <libsecret/secret.h>
#include <sodium.h>

#include <functional>
#include <memory>
#include <set>
#include <utility>

#include "daemon/credentials/CredentialBytes.h"

namespace credentials {
namespace {

using base::Failure;
using base::FailureKind;
using base::Result;

constexpr int kBase64 = sodium_base64_VARIANT_ORIGINAL;

constexpr const char* kLocked = "the desktop's keyring is locked; unlock it";

// Attributes of an item. A credential has them all, but the account's own has no client.
constexpr const char* kDatabase = "database";
constexpr const char* kAccount = "account";
constexpr const char* kKind = "kind";
constexpr const char* kClient = "client";
// Values of "kind". An item without the attribute "client" could not be searched for without it.
constexpr const char* kOfAccount = "account";
constexpr const char* kOfClient = "client";

const SecretSchema* schema() {
  static const SecretSchema* const kSchema = secret_schema_new("com.zentor.rvd.Credential",
                                                               SECRET_SCHEMA_NONE,
                                                               kDatabase,
                                                               SECRET_SCHEMA_ATTRIBUTE_STRING,
                                                               kAccount,
                                                               SECRET_SCHEMA_ATTRIBUTE_STRING,
                                                               kKind,
                                                               SECRET_SCHEMA_ATTRIBUTE_STRING,
                                                               kClient,
                                                               SECRET_SCHEMA_ATTRIBUTE_STRING,
                                                               nullptr);
  return kSchema;
}

struct Release {
  void operator()(gpointer object) const { g_object_unref(object); }
  void operator()(GError* error) const { g_error_free(error); }
  void operator()(GHashTable* table) const { g_hash_table_unref(table); }
  void operator()(GBytes* bytes) const { g_bytes_unref(bytes); }
  void operator()(SecretValue* value) const { secret_value_unref(value); }
  void operator()(GList* objects) const { g_list_free_full(objects, g_object_unref); }
  void operator()(char* text) const { g_free(text); }
};
template <typename T>
using Owned = std::unique_ptr<T, Release>;

// Takes the error.
Failure failureFrom(GError* taken) {
  const Owned<GError> error(taken);
  if (g_error_matches(taken, G_IO_ERROR, G_IO_ERROR_CANCELLED))
    return {FailureKind::kFailed, "the desktop's keyring did not answer in time"};
  if (g_error_matches(taken, SECRET_ERROR, SECRET_ERROR_IS_LOCKED)) return {FailureKind::kFailed, kLocked};
  g_dbus_error_strip_remote_error(taken);
  return {FailureKind::kFailed, std::string("the desktop's keyring cannot be used: ") + taken->message};
}

// The keyring during one call: a loop of its own on the calling thread, which ends in time.
class Conversation {
 public:
  explicit Conversation(std::chrono::milliseconds longest)
      : context_(g_main_context_new()),
        cancellable_(g_cancellable_new()),
        deadline_(g_timeout_source_new(static_cast<guint>(longest.count()))) {
    g_main_context_push_thread_default(context_);
    g_source_set_callback(deadline_, cancel, cancellable_.get(), nullptr);
    g_source_attach(deadline_, context_);
  }
  Conversation(const Conversation&) = delete;
  Conversation& operator=(const Conversation&) = delete;
  ~Conversation() {
    collection_.reset();
    service_.reset();
    connection_.reset();
    g_source_destroy(deadline_);
    g_source_unref(deadline_);
    while (g_main_context_iteration(context_, FALSE)) {  // what was let go of is cleared away here
    }
    g_main_context_pop_thread_default(context_);
    g_main_context_unref(context_);
  }

  using Start = std::function<void(GCancellable*, GAsyncReadyCallback, gpointer)>;

  // Starts what an asynchronous function of the libraries does, and returns when it has come to its end.
  Owned<GAsyncResult> run(const Start& start) {
    GAsyncResult* result = nullptr;
    start(cancellable_.get(), take, &result);
    while (result == nullptr) g_main_context_iteration(context_, TRUE);
    return Owned<GAsyncResult>(result);
  }

  // Finds the keyring, and its default collection unlocked.
  Result<void> open() {
    if (auto connected = connect(); !connected) return connected;
    GError* error = nullptr;
    const auto result = run([this](GCancellable* cancellable, GAsyncReadyCallback done, gpointer data) {
      secret_collection_for_alias(
          service_.get(), SECRET_COLLECTION_DEFAULT, SECRET_COLLECTION_NONE, cancellable, done, data);
    });
    collection_.reset(secret_collection_for_alias_finish(result.get(), &error));
    if (error != nullptr) return failureFrom(error);
    if (collection_ == nullptr)
      return Failure{FailureKind::kFailed, "the desktop's keyring has no default collection"};
    if (secret_collection_get_locked(collection_.get()) != FALSE)
      return Failure{FailureKind::kFailed, kLocked};
    return {};
  }

  // After open().
  SecretService* service() const { return service_.get(); }
  SecretCollection* collection() const { return collection_.get(); }

 private:
  static gboolean cancel(gpointer cancellable) {
    g_cancellable_cancel(static_cast<GCancellable*>(cancellable));
    return G_SOURCE_REMOVE;
  }
  static void take(GObject*, GAsyncResult* result, gpointer data) {
    *static_cast<GAsyncResult**>(data) = static_cast<GAsyncResult*>(g_object_ref(result));
  }

  Result<void> connect() {
    GError* error = nullptr;
    const auto connected = run([](GCancellable* cancellable, GAsyncReadyCallback done, gpointer data) {
      g_bus_get(G_BUS_TYPE_SESSION, cancellable, done, data);
    });
    connection_.reset(g_bus_get_finish(connected.get(), &error));
    if (connection_ == nullptr) return failureFrom(error);
    // When the bus goes, the daemon ends in order.
    g_dbus_connection_set_exit_on_close(connection_.get(), FALSE);
    const auto opened = run([](GCancellable* cancellable, GAsyncReadyCallback done, gpointer data) {
      // By name, so that the environment cannot name another. The secrets are sealed on their way.
      secret_service_open(SECRET_TYPE_SERVICE,
                          "org.freedesktop.secrets",
                          SECRET_SERVICE_OPEN_SESSION,
                          cancellable,
                          done,
                          data);
    });
    service_.reset(secret_service_open_finish(opened.get(), &error));
    if (service_ == nullptr) return failureFrom(error);
    return {};
  }

  GMainContext* const context_;
  const Owned<GCancellable> cancellable_;
  GSource* const deadline_;
  Owned<GDBusConnection> connection_;
  Owned<SecretService> service_;
  Owned<SecretCollection> collection_;
};

// An ID as an attribute's value, which is UTF-8 without zero bytes: what no ID usually has is escaped.
char* escaped(const std::string& id) {
  return g_uri_escape_bytes(reinterpret_cast<const guint8*>(id.data()), id.size(), nullptr);
}

std::optional<std::string> unescaped(const char* text) {
  if (text == nullptr) return std::nullopt;
  const Owned<GBytes> bytes(g_uri_unescape_bytes(text, -1, nullptr, nullptr));
  if (bytes == nullptr) return std::nullopt;
  gsize size = 0;
  const auto* data = static_cast<const char*>(g_bytes_get_data(bytes.get(), &size));
  return size == 0 ? std::string() : std::string(data, size);
}

using Attributes = Owned<GHashTable>;

Attributes attributesOf(const std::string& database) {
  Attributes attributes(g_hash_table_new_full(g_str_hash, g_str_equal, nullptr, g_free));
  g_hash_table_insert(attributes.get(), const_cast<char*>(kDatabase), escaped(database));
  return attributes;
}

Attributes attributesOf(const std::string& database, const Place& place) {
  Attributes attributes = attributesOf(database);
  const auto set = [&](const char* name, char* value) {
    g_hash_table_insert(attributes.get(), const_cast<char*>(name), value);
  };
  set(kAccount, escaped(place.accountId));
  set(kKind, g_strdup(place.clientId ? kOfClient : kOfAccount));
  if (place.clientId) set(kClient, escaped(*place.clientId));
  return attributes;
}

std::optional<Place> placeFrom(GHashTable* attributes) {
  const auto get = [&](const char* name) {
    return static_cast<const char*>(g_hash_table_lookup(attributes, name));
  };
  const auto account = unescaped(get(kAccount));
  const char* kind = get(kKind);
  if (!account || kind == nullptr) return std::nullopt;
  if (std::string_view(kind) == kOfAccount) return Place{*account, std::nullopt};
  auto client = unescaped(get(kClient));
  if (std::string_view(kind) != kOfClient || !client) return std::nullopt;
  return Place{*account, std::move(client)};
}

// What a person reads in a list of passwords.
std::string labelOf(const Place& place) {
  const Owned<char> client(place.clientId ? escaped(*place.clientId) : nullptr);
  const Owned<char> account(escaped(place.accountId));
  return client != nullptr ? std::string("rvd: access of ") + client.get() + " to account " + account.get()
                           : std::string("rvd: account ") + account.get();
}

// Every item with these attributes, none of them locked.
Result<Owned<GList>> search(Conversation& keyring, const Attributes& attributes, bool withSecrets) {
  const int flags = SECRET_SEARCH_ALL | (withSecrets ? SECRET_SEARCH_LOAD_SECRETS : 0);
  const auto result = keyring.run([&](GCancellable* cancellable, GAsyncReadyCallback done, gpointer data) {
    secret_service_search(keyring.service(),
                          schema(),
                          attributes.get(),
                          static_cast<SecretSearchFlags>(flags),
                          cancellable,
                          done,
                          data);
  });
  GError* error = nullptr;
  Owned<GList> items(secret_service_search_finish(keyring.service(), result.get(), &error));
  if (error != nullptr) return failureFrom(error);
  for (const GList* item = items.get(); item != nullptr; item = item->next)
    if (secret_item_get_locked(static_cast<SecretItem*>(item->data)) != FALSE)
      return Failure{FailureKind::kFailed, kLocked};
  return items;
}

Result<void> deleteItem(Conversation& keyring, SecretItem* item) {
  const auto result = keyring.run([&](GCancellable* cancellable, GAsyncReadyCallback done, gpointer data) {
    secret_item_delete(item, cancellable, done, data);
  });
  GError* error = nullptr;
  secret_item_delete_finish(item, result.get(), &error);
  if (error != nullptr) return failureFrom(error);
  return {};
}

SecretValue* valueFrom(const RVAccountCredential& credential) {
  const RVSecret bytes = bytesFromCredential(credential);
  const std::string_view plain = bytes.reveal();
  std::string text(sodium_base64_encoded_len(plain.size(), kBase64), '\0');
  sodium_bin2base64(
      text.data(), text.size(), reinterpret_cast<const unsigned char*>(plain.data()), plain.size(), kBase64);
  SecretValue* value = secret_value_new(text.c_str(), -1, "text/plain");
  RVSecret::wipe(text.data(), text.size());
  return value;
}

std::optional<RVAccountCredential> credentialFrom(SecretValue* value) {
  gsize size = 0;
  const char* text = secret_value_get(value, &size);
  std::string plain(size, '\0');
  std::size_t plainSize = 0;
  const int result = sodium_base642bin(reinterpret_cast<unsigned char*>(plain.data()),
                                       plain.size(),
                                       text,
                                       size,
                                       nullptr,
                                       &plainSize,
                                       nullptr,
                                       kBase64);
  const RVSecret bytes(std::string_view(plain.data(), result == 0 ? plainSize : 0));
  RVSecret::wipe(plain.data(), plain.size());
  return credentialFromBytes(bytes);
}

}  // namespace

SecretServiceStore::SecretServiceStore(std::string database, std::chrono::milliseconds longest)
    : database_(std::move(database)),
      longest_(longest) {
}

Result<std::optional<RVAccountCredential>> SecretServiceStore::read(const Place& place) {
  Conversation keyring(longest_);
  if (auto opened = keyring.open(); !opened) return opened.failure();
  const auto items = search(keyring, attributesOf(database_, place), true);
  if (!items) return items.failure();
  SecretItem* newest = nullptr;
  for (const GList* entry = items->get(); entry != nullptr; entry = entry->next) {
    auto* item = static_cast<SecretItem*>(entry->data);
    if (newest == nullptr || secret_item_get_modified(item) > secret_item_get_modified(newest)) newest = item;
  }
  if (newest == nullptr) return std::optional<RVAccountCredential>();
  const Owned<SecretValue> value(secret_item_get_secret(newest));
  if (value == nullptr) return Failure{FailureKind::kFailed, "the desktop's keyring has not handed it out"};
  auto credential = credentialFrom(value.get());
  if (!credential)
    return Failure{FailureKind::kDamaged, "what the desktop's keyring holds there is no credential"};
  return credential;
}

Result<void> SecretServiceStore::write(const Place& place, const RVAccountCredential& credential) {
  Conversation keyring(longest_);
  if (auto opened = keyring.open(); !opened) return opened;
  const Attributes attributes = attributesOf(database_, place);
  const auto earlier = search(keyring, attributes, false);
  if (!earlier) return earlier.failure();
  const Owned<SecretValue> value(valueFrom(credential));
  const auto result = keyring.run([&](GCancellable* cancellable, GAsyncReadyCallback done, gpointer data) {
    secret_item_create(keyring.collection(),
                       schema(),
                       attributes.get(),
                       labelOf(place).c_str(),
                       value.get(),
                       SECRET_ITEM_CREATE_REPLACE,
                       cancellable,
                       done,
                       data);
  });
  GError* error = nullptr;
  const Owned<SecretItem> created(secret_item_create_finish(result.get(), &error));
  if (created == nullptr) return failureFrom(error);
  // One in another collection is not replaced.
  const auto pathOf = [](gpointer item) {
    return std::string_view(g_dbus_proxy_get_object_path(static_cast<GDBusProxy*>(item)));
  };
  for (const GList* item = earlier->get(); item != nullptr; item = item->next) {
    if (pathOf(item->data) == pathOf(created.get())) continue;
    if (auto deleted = deleteItem(keyring, static_cast<SecretItem*>(item->data)); !deleted) return deleted;
  }
  return {};
}

Result<void> SecretServiceStore::remove(const Place& place) {
  Conversation keyring(longest_);
  if (auto opened = keyring.open(); !opened) return opened;
  const auto items = search(keyring, attributesOf(database_, place), false);
  if (!items) return items.failure();
  for (const GList* item = items->get(); item != nullptr; item = item->next)
    if (auto deleted = deleteItem(keyring, static_cast<SecretItem*>(item->data)); !deleted) return deleted;
  return {};
}

Result<std::vector<Place>> SecretServiceStore::places() {
  Conversation keyring(longest_);
  if (auto opened = keyring.open(); !opened) return opened.failure();
  const auto items = search(keyring, attributesOf(database_), false);
  if (!items) return items.failure();
  std::set<Place> places;
  for (const GList* item = items->get(); item != nullptr; item = item->next) {
    const Attributes attributes(secret_item_get_attributes(static_cast<SecretItem*>(item->data)));
    if (auto place = placeFrom(attributes.get())) places.insert(*std::move(place));
  }
  return std::vector<Place>(places.begin(), places.end());
}

}  // namespace credentials
