// Explanations by the plug-in over a fake host, and the real requests that they speak of.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "daemon/plugins/StringTable.h"
#include "daemon/rehearsal/Explanation.h"
#include "tests/fakes/FakeTexts.h"

namespace rehearsal_tests {

// Plug-in objects with the English words of the built bundle.
inline std::shared_ptr<RVDAccountAccessPlugin> makePlugin(const RVDHostServices& services) {
  static fakes::FakeLog log;
  static plugins::StringTable table(BUILT_PLUGINS "/TKFacebookAccountAccessPlugin/resources", {}, log);
  RVDHostServices own = services;
  own.stringTable = &table;
  return TKFacebookAccountAccessPlugin::init(own);
}

}  // namespace rehearsal_tests
