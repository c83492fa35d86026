// Prints what the user reads: every permission alone, and every combination of clauses.
#include <iostream>

#include "tests/support/Sentences.h"

namespace {

void print(support::SentenceMaker& maker, const std::vector<support::ConsentRequest>& requests) {
  for (const support::ConsentRequest& request : requests) {
    for (const std::string& permission : request.permissions) std::cout << permission << ' ';
    std::cout << (request.audience ? "[" + *request.audience + "]\n" : "\n");
    const auto alert = maker.alertFor(request);
    std::cout << "    " << (alert ? alert->message : "(no alert)") << "\n";
  }
}

}  // namespace

int main() {
  support::SentenceMaker maker;
  if (const auto alert = maker.alertFor({})) {
    std::cout << "Title:   " << alert->title << "\nButtons: " << alert->allowButton << " | "
              << alert->doNotAllowButton << "\n";
  }
  std::cout << "\nEach permission alone\n\n";
  print(maker, support::everyPermissionAlone());
  std::cout << "\nAll combinations\n\n";
  print(maker, support::everyCombination());
}
