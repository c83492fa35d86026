// Callbacks that are owed to somebody.
#pragma once

#include <functional>
#include <memory>
#include <tuple>
#include <utility>

// A callback that runs exactly once: with the arguments of the first call, or, where the last copy goes
// without one, with the fallback given at the start. So whoever waits for it is answered also when a host
// service throws or drops the handler that holds it.
//
// Copies share the one debt. Calls may come from any thread, but not at the same time.
template <typename Signature>
class Owed;

template <typename... Arguments>
class Owed<void(Arguments...)> {
 public:
  explicit Owed(std::function<void(Arguments...)> callback, std::decay_t<Arguments>... fallback)
      : debt_(std::make_shared<Debt>(std::move(callback), std::move(fallback)...)) {}

  // Pays the debt; does nothing where it is paid already. An exception of the callback passes through.
  void operator()(Arguments... arguments) const {
    if (const auto callback = std::exchange(debt_->callback, nullptr)) callback(arguments...);
  }

 private:
  struct Debt {
    Debt(std::function<void(Arguments...)> owedCallback, std::decay_t<Arguments>... owedFallback)
        : callback(std::move(owedCallback)),
          fallback(std::move(owedFallback)...) {}
    Debt(const Debt&) = delete;
    Debt& operator=(const Debt&) = delete;
    ~Debt() {
      if (!callback) return;
      try {
        std::apply(callback, fallback);
      } catch (...) {  // Nobody is left to hear of it: this runs where another exception may be on its way.
      }
    }

    std::function<void(Arguments...)> callback;
    std::tuple<std::decay_t<Arguments>...> fallback;
  };

  std::shared_ptr<Debt> debt_;
};
