#pragma once

#include "operations/job/exceptions.h"

#include <string>

namespace krv::tool
{

// The command line asks for something that does not make sense, by itself or for the file.
using UsageError = krv::operations::RequestException;

// What the exception that is being handled means to the user, on one line: file, cause, and what to do about it. To be
// called in a catch block only. file: the file that the verb works on, for exceptions that name none.
// With bVerbose the function, source file and line of the throw follow in brackets.
std::string DescribeError(const std::string& file, bool bVerbose);

// What the exception that is being handled says by itself, on one line, whatever its kind.
std::string CurrentMessage();

// The text as a terminal may show it: line breaks and tabs are blanks, other controls and bytes that are no UTF-8 are
// written as \\x1b, and of a very long text the middle is left out.
std::string OneLine(const std::string& text);

} // namespace krv::tool
