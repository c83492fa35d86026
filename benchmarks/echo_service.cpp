// Answers a call of the shape of an access request at once: what the bus and its library cost alone.
#include <sdbus-c++/sdbus-c++.h>

#include <map>
#include <string>
#include <tuple>

int main() {
  auto connection = sdbus::createSessionBusConnection("com.zentor.rvd.Echo");
  auto object = sdbus::createObject(*connection, "/com/zentor/rvd/echo");
  using Dictionary = std::map<std::string, sdbus::Variant>;
  object->registerMethod("Echo")
      .onInterface("com.zentor.rvd.Echo")
      .implementedAs([](const std::string&, const Dictionary&, bool interaction) {
        return std::make_tuple(interaction, Dictionary{});
      });
  object->finishRegistration();
  connection->enterEventLoop();
}
