#include "plr/ipc/result_errors.h"

namespace plr {

ResultIsEmptyError::ResultIsEmptyError()
    : runtime_error("ResultIsEmptyError: the result was never set with a success or error value") {}
ResultIsEmptyError::~ResultIsEmptyError() = default;

ResultIsNotError::ResultIsNotError()
    : runtime_error("ResultIsNotError: cannot return an error unless it was an error") {}
ResultIsNotError::~ResultIsNotError() = default;

ResultIsError::ResultIsError()
    : runtime_error("ResultIsError: cannot return a result because the operation was an error") {}
ResultIsError::~ResultIsError() = default;

}  // namespace plr
