#pragma once

#include "base/UniqueFd.h"

#include <functional>
#include <memory>
#include <thread>

namespace kelvo::ctl {

/// What is typed, key by key on a terminal, else byte by byte from standard input. While it lives the
/// terminal does not echo.
class Keys {
  public:
    /// `handler` runs for each key on a thread of its own.
    explicit Keys(std::function<void(char)> handler);
    ~Keys();
    Keys(const Keys&) = delete;
    Keys& operator=(const Keys&) = delete;

  private:
    struct Terminal;
    void read(const std::function<void(char)>& handler) const;

    const std::unique_ptr<Terminal> terminal_;
    const UniqueFd stopEvent_;
    std::thread reader_;
};

}  // namespace kelvo::ctl
