#include "toolkit/xml/xmlerror.h"

#include <utility>

namespace krv::xml
{

ParseError::ParseError(std::string description) : moDescription(std::move(description)) {}

ParseError::ParseError(const ParseError&) = default;
ParseError& ParseError::operator=(const ParseError&) = default;
ParseError::~ParseError() = default;

const char* ParseError::what() const noexcept
{
    return moDescription.c_str();
}

} // namespace krv::xml
