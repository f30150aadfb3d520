#pragma once

#include <string>

#include "common/error.h"

namespace ferrox::engine {

/// A failure whose sentence an ordinary user may read: it follows from the request and from what this user may see.
class UserError : public Error {
 public:
  using Error::Error;
};

/// What an ordinary user is told of a failure: the sentence of a UserError, and of what is wrong with the request
/// itself. Any other failure's may name files or what others have, and is replaced by one that follows from its code.
std::string SentenceForUsers(const Error& error);

}  // namespace ferrox::engine
