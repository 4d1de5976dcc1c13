#pragma once

#include <string>

namespace krv::datasources
{
class IDataset;
}

namespace krv::fuzz
{

// Opens a file through the manager and asks for all that it can tell, and for some pixels of everything that has any:
// channels with margins, levels, bitmaps. A krv::Exception at any point is an answer; every other one gets out.
void ExerciseFile(const std::string& fileName);

// Its tags, reference system, geocoding, colour tables: no pixels.
void ExerciseDescription(krv::datasources::IDataset& oDataset);

// At the end of the program, says how many reference systems the files had: a search that finds none tries nothing.
void ReportSystems();

} // namespace krv::fuzz
