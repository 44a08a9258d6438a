#pragma once

#include <stdexcept>

#include "plr/base/export.h"

// What a result (plr/ipc/result.h) throws when it is read as what it is not.
namespace plr {

// It was read before anything was set.
class PLR_EXPORT ResultIsEmptyError : public std::runtime_error {
  public:
    ResultIsEmptyError();
    ~ResultIsEmptyError() override;
};

// Its error was asked for, and it holds a value.
class PLR_EXPORT ResultIsNotError : public std::runtime_error {
  public:
    ResultIsNotError();
    ~ResultIsNotError() override;
};

// Its value was asked for, and it holds an error.
class PLR_EXPORT ResultIsError : public std::runtime_error {
  public:
    ResultIsError();
    ~ResultIsError() override;
};

}  // namespace plr
