#pragma once

#include "gobs/resampling/levelreducer.h"

namespace krv::gobs::detail
{

// What MakeLevelReducer chooses from by the method.
std::unique_ptr<ILevelReducer> MakeBoxReducer(const SourceForm& oForm, const LevelTask& oTask,
                                              const ReductionRule& oRule);
std::unique_ptr<ILevelReducer> MakeKernelReducer(const SourceForm& oForm, const LevelTask& oTask, Resampling eMethod);

} // namespace krv::gobs::detail
