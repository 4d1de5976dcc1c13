#pragma once

#include <cstddef>
#include <source_location>
#include <string>
#include <string_view>

namespace krv
{

// Turns a compiler's file name into the name by which the library reports a source file: the path from the root of the
// source tree without its ending, such as "datasources/reader/basicreader". The tree may lie below folders that are
// named like its own: the last one in the path counts, unless the path begins with one.
// The result is a part of the argument and lives as long. A name without a known folder stays whole but for its ending.
constexpr std::string_view SourceFileText(std::string_view file)
{
    constexpr std::string_view ROOTS[] = {"datasources/", "toolkit/", "gobs/", "operations/", "plugins/", "tools/"};
    std::size_t nLast = 0;
    bool bBegins = false;
    for (const std::string_view root : ROOTS)
    {
        bBegins = bBegins || file.starts_with(root);
        for (std::size_t nAt = file.find(root); nAt != std::string_view::npos; nAt = file.find(root, nAt + 1))
            if (nAt > nLast && file[nAt - 1] == '/')
                nLast = nAt;
    }
    if (!bBegins)
        file.remove_prefix(nLast);
    const auto nDot = file.rfind('.');
    return nDot == std::string_view::npos ? file : file.substr(0, nDot);
}

// Where an exception was thrown: the full signature of the function, the source file and the line. Costs nothing to
// make and holds no memory of its own; its texts live as long as the library. As a default argument `const Place&
// oPlace = Place::Current()` it names the caller.
// Example, a check in a function of its own that names the caller's caller:
//   void Check(bool bGood, const Place& oPlace) { if (!bGood) throw DataException("It is bad", oPlace); }
class Place
{
public:
    // pFunction, sourceFile: borrowed, never freed; texts of the program itself, as the compiler hands them out.
    constexpr Place(const char* pFunction, std::string_view sourceFile, unsigned int nLine)
        : mpFunction(pFunction), moSourceFile(sourceFile), mnLine(nLine)
    {
    }

    // The place of the call; a function that throws on behalf of a public operation takes its place as an argument.
    static constexpr Place Current(std::source_location oLocation = std::source_location::current())
    {
        return AtLine(oLocation.line(), oLocation);
    }

    // As Current, with a line number that is part of the contract of the operation.
    // For the few throws whose line programs compare; others take Current.
    static constexpr Place AtLine(unsigned int nLine, std::source_location oLocation = std::source_location::current())
    {
        return {oLocation.function_name(), oLocation.file_name(), nLine};
    }

    // Empty texts and line 0, for the throws that deliberately say no place.
    // GetFunction and GetSourceFile are empty then.
    static constexpr Place None() { return {"", "", 0}; }

    // A new text, such as "krv::gobs::Raster* krv::datasources::BasicReader::GetRaster(unsigned int)".
    std::string GetFunction() const { return mpFunction; }
    // In the form of SourceFileText.
    std::string GetSourceFile() const { return std::string(SourceFileText(moSourceFile)); }

    // Counts from 1; 0 when there is no place.
    unsigned int GetLine() const { return mnLine; }

private:
    const char* mpFunction;
    std::string_view moSourceFile;
    unsigned int mnLine;
};

} // namespace krv
