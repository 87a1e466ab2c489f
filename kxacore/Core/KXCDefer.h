// KXCDefer: a scope guard that runs a block when it is destroyed, however
// the scope ends (return, break, or an exception unwinding through it).
//
//   mutex.lock();
//   const auto unlock = KXCDefer::deferWith([&] { mutex.unlock(); });
//   ...                                  // unlocked when `unlock` goes
//
// `deferWith` is the class-level "using" operation under a name C++ allows;
// the constructor is the initialiser from a block. Both keep their own copy
// of the block. There is deliberately no way to dismiss a guard: once made,
// the block runs.
//
// A guard is neither copyable nor movable, so the block runs exactly once;
// `deferWith` still returns it by value (C++17 guaranteed elision), so
// `auto guard = KXCDefer::deferWith(...)` compiles. The block must not throw:
// it runs in a destructor, where an exception ends the process.
// Thread safety: a guard belongs to the scope that made it.
#pragma once

#include <functional>
#include <utility>

class KXCDefer {
 public:
  using Block = std::function<void()>;

  // A guard that runs `block` at the end of the caller's scope. An empty
  // block is allowed and runs nothing.
  [[nodiscard]] static KXCDefer deferWith(Block block) { return KXCDefer(std::move(block)); }

  explicit KXCDefer(Block block) noexcept : deferred_(std::move(block)) {}
  ~KXCDefer() {
    if (deferred_) deferred_();
  }

  KXCDefer(const KXCDefer&) = delete;
  KXCDefer& operator=(const KXCDefer&) = delete;
  KXCDefer(KXCDefer&&) = delete;
  KXCDefer& operator=(KXCDefer&&) = delete;

 private:
  const Block deferred_;
};
