#pragma once

#include "plugins/support/file/file.h"
#include "plugins/tif/reading/rawdirectory.h"
#include "plugins/tif/writing/pagemodel.h"

#include <memory>
#include <vector>

namespace krv::plugins::tif
{

// Writes a file anew so that it can be read in few requests over a network: the header, all directories with their
// values, the image first and its levels from large to small, and then the blocks, those of the smallest level first
// and in each page in their order. Blocks are copied as they are stored. bSorted: otherwise pages stay in their order.
//
// oPages: of the chain, their tags in memory; the first is the image. Throws IOException.
void WriteCloudLayout(const std::vector<std::shared_ptr<PageModel>>& oPages, const FileHeader& oHeader,
                      const support::File& oSource, support::File& oTarget, bool bSorted);

} // namespace krv::plugins::tif
