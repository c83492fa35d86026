// The decision rules once more, as small and plain as they can be put, to compare the plug-in with.
//
// Shares no code with the plug-in: no lists, no option readers, no sets of its own making. It knows a
// handful of permissions and says what category each is in.
#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace support {

using Names = std::set<std::string>;

// A request's options, reduced to what matters: each is absent, a text, or something that is no text.
struct ModelOptions {
  enum class Kind { kAbsent, kText, kOther };
  Kind appIDKind = Kind::kAbsent;
  std::string appID;
  Kind permissionsKind = Kind::kAbsent;  // kText: a list
  Names permissions;
  Kind audienceKind = Kind::kAbsent;
  std::string audience;
};

enum class ModelReply {
  kTokenAndList,  // a token, and a list of what is granted
  kTokenWithoutList,
  kTokenAndNonsense,  // a token, and a list that is none
  kErrorMessage,
  kNeither,     // an object with neither token nor message
  kNoObject,    // a document that is no object
  kNoDocument,  // bytes that are no document
  kTransportError,
  kNothing,  // neither bytes nor error
  kDropped,  // the handler is never called
  kThrown,   // the exchange cannot be started
};

enum class ModelDescription {
  kText,
  kEmpty,
  kUnknown,
  kNoString,
  kNoDocument,
  kTransportError,
  kNothing,
  kDropped,
  kThrown
};

struct ModelClient {
  std::optional<std::string> id;
  bool allAccounts = false;
  bool defaultAccess = false;
};

struct ModelRecord {
  bool granted = false;
  std::optional<Names> permissions;
  bool hasOptions = false;
  std::string appID;
  std::optional<std::string> audience;
  bool audienceIsOther = false;

  friend bool operator==(const ModelRecord&, const ModelRecord&) = default;
};

// What the world sees of one operation.
struct ModelOutcome {
  bool granted = false;
  std::string error;  // empty: none; otherwise "domain code" of it
  bool alertShown = false;
  bool authorizationAsked = false;
  bool descriptionAsked = false;
  int tokensRevoked = 0;

  friend bool operator==(const ModelOutcome&, const ModelOutcome&) = default;
};

class DecisionModel {
 public:
  bool hasAccount = true;
  bool storeIsBroken = false;     // writing records fails
  bool ignorePreference = false;  // as the preferences layer reads it now

  std::map<std::string, ModelRecord> records;
  Names credentials;  // the clients that have one
  struct Logged {
    std::optional<std::string> client;
    bool granted;
    bool requested;
    friend bool operator==(const Logged&, const Logged&) = default;
  };
  std::vector<Logged> log;
  bool preferenceWasRead = false;  // by the last operation

  // allows: what the user answers where asked. granted: the list of a reply that has one.
  ModelOutcome request(const ModelClient& client,
                       const ModelOptions& options,
                       bool allows,
                       ModelReply reply,
                       const Names& granted,
                       ModelDescription description);
  ModelOutcome authorize(const ModelClient& client, ModelReply reply, const Names& granted);
  ModelOutcome revoke(const ModelClient& client);
  ModelOutcome revokeAll();

  static bool isWrite(const std::string& name) { return name.starts_with("publish"); }
  static bool isUnknown(const std::string& name) { return name.starts_with("x_"); }

 private:
  ModelOutcome answered(const ModelClient& client,
                        const ModelOptions& options,
                        bool yes,
                        bool held,
                        const Names& existing,
                        const Names& wanted,
                        ModelReply reply,
                        const Names& granted,
                        ModelOutcome outcome);
  // Asks the server; the permissions it grants, absent where it does not.
  std::optional<Names> ask(const ModelClient& client,
                           ModelReply reply,
                           const Names& granted,
                           ModelOutcome& outcome);
  bool write(const ModelClient& client, const ModelRecord& record);
};

}  // namespace support
