#include "cli/CommandLine.h"

#include <CLI/CLI.hpp>
#include <charconv>
#include <exception>
#include <functional>
#include <sstream>
#include <utility>
#include <vector>

#include "base/Text.h"
#include "cli/Period.h"

namespace cli {
namespace {

constexpr const char* kPreferencesApplication = "com.zentor.tessel.facebook";
constexpr const char* kExitStatus =
    "Exit status: 0 granted or done, 1 refused, 2 wrong use, 3 could not be done.";

using Text = std::optional<std::string>;

// The parser, what the options are read into, and the sub-command that was chosen.
struct CommandLine {
  CLI::App app{"Manages the accounts and the access that rvd looks after, and asks for access.", "rvctl"};
  bool wantsJSON = false;
  Text subject;  // the sub-command's positional arguments
  Text value;
  Text application;
  Text descriptor;
  Text as;
  Text appID;
  Text permissions;
  Text audience;
  Text limit;
  Text client;
  Text since;
  Text until;
  Text language;
  bool all = false;
  bool online = false;
  bool pending = false;
  std::function<ExitStatus(Session&)> chosen;
};

base::Failure wrong(const std::string& message) {
  return {base::FailureKind::kInvalid, message};
}

CLI::App* addGroup(CommandLine& line, const char* name, const char* description) {
  CLI::App* group = line.app.add_subcommand(name, description);
  group->require_subcommand(1);
  group->footer(kExitStatus);
  return group;
}

CLI::App* addCommand(CommandLine& line,
                     CLI::App* parent,
                     const char* name,
                     const char* description,
                     std::function<ExitStatus(Session&)> body) {
  CLI::App* command = parent->add_subcommand(name, description);
  command->add_flag("--json", line.wantsJSON, "print JSON");
  command->footer(kExitStatus);
  command->final_callback([&line, body = std::move(body)] { line.chosen = body; });
  return command;
}

// An empty text that is given is not the same as none.
CLI::Option* addText(CLI::App* command,
                     const char* name,
                     Text& target,
                     const char* kind,
                     const char* description) {
  return command
      ->add_option_function<std::string>(
          name, [&target](const std::string& text) { target = text; }, description)
      ->type_name(kind);
}

CLI::Option* addSubject(CommandLine& line, CLI::App* command, const char* name, const char* description) {
  return addText(command, name, line.subject, "", description)->required();
}

template <typename Number>
base::Result<Number> numberFrom(const std::string& text, const char* problem) {
  Number number{};
  const char* end = text.data() + text.size();
  const auto [read, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || read != end || text.starts_with('-')) return wrong(problem);
  return number;
}

std::vector<std::string> namesIn(const std::string& list) {
  std::vector<std::string> names;
  std::istringstream rest(list);
  for (std::string name; std::getline(rest, name, ',');) names.push_back(name);
  return names;
}

void addAccountCommands(CommandLine& line) {
  CLI::App* group = addGroup(line, "account", "Add, list and remove accounts");
  CLI::App* adding = addCommand(
      line, group, "add", "Set up an account; its token comes from stdin", [&line](Session& session) {
        const auto descriptor = numberFrom<int>(line.descriptor.value_or("0"),
                                                "--token-fd takes the number of a file descriptor");
        if (!descriptor) return session.output.failed(descriptor.failure());
        return addAccount(session, *line.subject, *descriptor);
      });
  addSubject(line, adding, "USERNAME", "the account's user name");
  addText(adding, "--token-fd", line.descriptor, "N", "read the token from this file descriptor instead");
  addCommand(line, group, "list", "List the accounts", listAccounts);
  CLI::App* removing = addCommand(
      line, group, "remove", "Revoke all access, then remove an account", [&line](Session& session) {
        return removeAccount(session, *line.subject);
      });
  addSubject(line, removing, "ID", "the account's ID, as 'rvctl account list' shows it");
}

RequestOptions requestOptions(const CommandLine& line) {
  RequestOptions options{line.appID, std::nullopt, line.audience};
  if (line.permissions) options.permissions = namesIn(*line.permissions);
  return options;
}

void addRequestOptions(CommandLine& line, CLI::App* command) {
  addText(command, "--app-id", line.appID, "ID", "the application's ID at Facebook");
  addText(command, "--permissions", line.permissions, "A,B", "names of permissions, between commas");
  addText(command, "--audience", line.audience, "WHO", "everyone, friends or only_me");
}

void addRequestCommand(CommandLine& line) {
  CLI::App* command = addCommand(
      line, &line.app, "request", "Ask for access, as an application does", [&line](Session& session) {
        return requestAccess(session, line.as, requestOptions(line));
      });
  addText(command, "--as", line.as, "APP_ID", "ask as this installed application");
  addRequestOptions(line, command);
}

void addExplainCommand(CommandLine& line) {
  CLI::App* command = addCommand(
      line, &line.app, "explain", "Show what a request would come to, and why", [&line](Session& session) {
        return explainAccess(
            session, *line.subject, {requestOptions(line), line.language.value_or(""), line.online});
      });
  addSubject(line, command, "CLIENT", "the application's ID");
  addRequestOptions(line, command);
  addText(command, "--language", line.language, "LANG", "the language of the alert, such as de (yours)");
  command->add_flag("--online", line.online, "have the server describe unknown permissions");
}

void addAccessCommand(CommandLine& line) {
  CLI::App* command = addCommand(
      line, &line.app, "access", "Show what access an application holds", [&line](Session& session) {
        std::optional<int> descriptor;
        if (line.descriptor) {
          const auto number =
              numberFrom<int>(*line.descriptor, "--credential-fd takes the number of a file descriptor");
          if (!number) return session.output.failed(number.failure());
          descriptor = *number;
        }
        return showAccess(session, line.as, descriptor);
      });
  addText(command, "--as", line.as, "APP_ID", "look as this installed application");
  addText(command, "--credential-fd", line.descriptor, "N", "write its token to this descriptor, 3 or more");
}

void addAuthorizationCommands(CommandLine& line) {
  constexpr const char* kClient = "the application's ID, as 'rvctl list' shows it";
  CLI::App* listing =
      addCommand(line,
                 &line.app,
                 "list",
                 "List the applications that were granted or refused",
                 [&line](Session& session) {
                   return line.pending ? listPendingRevocations(session) : listAuthorizations(session);
                 });
  listing->add_flag("--pending", line.pending, "list what the server has yet to be told instead");
  CLI::App* authorizing = addCommand(
      line, &line.app, "authorize", "Grant an application access, without asking", [&line](Session& session) {
        return authorize(session, *line.subject);
      });
  addSubject(line, authorizing, "CLIENT", "the application's ID");
  CLI::App* revoking =
      addCommand(line, &line.app, "revoke", "Take an application's access away", [&line](Session& session) {
        if (line.all == line.subject.has_value())
          return session.output.failed(wrong("Give either one CLIENT or --all"));
        return line.all ? revokeAll(session) : revoke(session, *line.subject);
      });
  addText(revoking, "CLIENT", line.subject, "", kClient);
  revoking->add_flag("--all", line.all, "of every application");
  CLI::App* forgetting =
      addCommand(line,
                 &line.app,
                 "forget",
                 "Forget a refusal, so that the user is asked again",
                 [&line](Session& session) { return forgetRefusal(session, *line.subject); });
  addSubject(line, forgetting, "CLIENT", kClient);
}

void addLogCommand(CommandLine& line) {
  CLI::App* command =
      addCommand(line, &line.app, "log", "Show what was asked for and decided", [&line](Session& session) {
        const auto limit = numberFrom<std::uint32_t>(line.limit.value_or("50"), "--limit takes a number");
        if (!limit) return session.output.failed(limit.failure());
        LogFilter filter{*limit, line.client, std::nullopt, std::nullopt};
        if (line.since) {
          const auto since = periodFrom(*line.since);
          if (!since) return session.output.failed(since.failure());
          filter.since = since->first;
        }
        if (line.until) {
          const auto until = periodFrom(*line.until);
          if (!until) return session.output.failed(until.failure());
          filter.until = until->last;
        }
        return showAccessLog(session, filter);
      });
  addText(command, "--client", line.client, "ID", "of this application alone");
  addText(command, "--since", line.since, "TIME", "from this day or time on (2024-05-01T12:30)");
  addText(command, "--until", line.until, "TIME", "up to this day or time, the whole of it");
  addText(command, "--limit", line.limit, "N", "how many entries, the newest first (50)");
}

void addPreferenceCommands(CommandLine& line) {
  CLI::App* group = addGroup(line, "preference", "Show, set and reset preferences");
  const auto add = [&](const char* name, const char* description, auto body) {
    CLI::App* command = addCommand(line, group, name, description, [&line, body](Session& session) {
      return body(session, line.application.value_or(kPreferencesApplication));
    });
    addSubject(line, command, "KEY", "the preference's name");
    addText(
        command, "--application", line.application, "ID", "whose preference (com.zentor.tessel.facebook)");
    return command;
  };
  add("get", "Show a preference", [&line](Session& session, const std::string& application) {
    return getPreference(session, application, *line.subject);
  });
  CLI::App* setting = add("set",
                          "Set a preference, in effect at once",
                          [&line](Session& session, const std::string& application) {
                            return setPreference(session, application, *line.subject, *line.value);
                          });
  addText(setting, "VALUE", line.value, "", "true, false, a number or other JSON; else a text")->required();
  add("reset",
      "Remove a preference, in effect at once",
      [&line](Session& session, const std::string& application) {
        return resetPreference(session, application, *line.subject);
      });
}

void addAgentCommand(CommandLine& line) {
  addCommand(
      line, &line.app, "agent", "Show alerts on this terminal and take the answers", [](Session& session) {
        return runAgent(session.output);
      });
}

// What is wrong with the command line. Never what was typed: it could be a secret in the wrong place.
std::string problemText(const CLI::ParseError& error) {
  if (dynamic_cast<const CLI::ExtrasError*>(&error) != nullptr)
    return "There is an argument that does not belong here";
  return error.what();
}

ExitStatus parseAndRun(int argc, const char* const* argv, Session& session) {
  for (int i = 0; i < argc; ++i)
    if (!base::isUTF8(argv[i])) return session.output.failed(wrong("The arguments have to be UTF-8"));
  CommandLine line;
  line.app.require_subcommand(1);
  line.app.footer(std::string("Help on one of them: rvctl COMMAND --help. ") + "All of it: man rvctl.");
  addAccountCommands(line);
  addRequestCommand(line);
  addAccessCommand(line);
  addExplainCommand(line);
  addAuthorizationCommands(line);
  addLogCommand(line);
  addPreferenceCommands(line);
  addAgentCommand(line);
  try {
    line.app.parse(argc, argv);
  } catch (const CLI::CallForHelp&) {
    session.output.print(line.app.help());
    return ExitStatus::kDone;
  } catch (const CLI::ParseError& error) {
    return session.output.failed(wrong(problemText(error) + ". Help: rvctl --help"));
  }
  if (line.wantsJSON) session.output.useJSON();
  return line.chosen(session);
}

}  // namespace

ExitStatus run(int argc, const char* const* argv, Session& session) {
  try {
    const ExitStatus status = parseAndRun(argc, argv, session);
    if (session.output.flush()) return status;
    return session.output.failed({base::FailureKind::kFailed, "Standard output cannot be written to"});
  } catch (const std::exception&) {
    // Of a JSON document with members of other types than theirs, or of the heap.
    return session.output.failed({base::FailureKind::kFailed, "rvd's answer makes no sense"});
  }
}

}  // namespace cli
