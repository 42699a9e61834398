#include "host/Exception.h"

namespace Kv::Exception {

Base::~Base() = default;
const char* Base::getTypeName() const noexcept { return "Base"; }
const char* Base::getMessage() const noexcept { return message_; }
const char* Base::getFile() const noexcept { return file_; }
int32_t Base::getLine() const noexcept { return line_; }

const char* RuntimeError::getTypeName() const noexcept { return "RuntimeError"; }
const char* LogicError::getTypeName() const noexcept { return "LogicError"; }

}  // namespace Kv::Exception
