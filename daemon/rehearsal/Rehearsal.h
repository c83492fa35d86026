// A request for access, run through a plug-in with no effect.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "daemon/rehearsal/RehearsedRequests.h"
#include "host/RVDAccountAccessPlugin.h"

namespace rehearsal {

// What a rehearsal runs over. Everything outlives it.
struct Stage {
  // The real ones. Preferences, queues, notifications and the JSON reader are handed to the plug-in, which
  // keeps the first that it meets for the whole process, and only reads them; the keychain is read. The
  // others are not touched.
  RVDHostServices services;
  std::shared_ptr<RVDAccountStore> store;  // the real one; read
  ProblemWithSending problemWithSending;
  std::optional<Server> server;  // absent: the server is not asked for anything
};

// Makes a plug-in object over services that stay valid until it is destroyed; the string table is its own
// affair. May throw.
using PluginMaker = std::function<std::shared_ptr<RVDAccountAccessPlugin>(const RVDHostServices& services)>;

struct Request {
  std::shared_ptr<const RVAccountType> accountType;
  std::shared_ptr<const RVDClient> client;
  RVDictionary options;
};

// What a request came to, where the user allows what they are asked, and the server has not answered yet.
struct Rehearsal {
  bool granted = false;
  std::optional<RVError> error;
  std::optional<RVDictionary> alert;  // as the plug-in describes it
  std::optional<RehearsedRequests::Prepared> description;
  bool hasInventedDescription = false;  // see RehearsedRequests
  std::optional<RehearsedRequests::Prepared> authorization;
  std::optional<RVDClientAuthorization> readRecord;     // as it stands
  std::optional<RVDClientAuthorization> writtenRecord;  // as it would stand
  std::vector<std::string> log;                         // the plug-in's lines, as the daemon's log has them
};

// Runs the request on this thread. Writes, asks and shows nothing, but that a server of the stage is asked
// for descriptions. Throws what the plug-in throws, and std::future_error where it drops its completion.
Rehearsal rehearse(const Stage& stage, const PluginMaker& makePlugin, const Request& request);

}  // namespace rehearsal
