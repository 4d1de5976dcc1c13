#include "operations/copy/detail/target.h"

#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "operations/copy/detail/keptform.h"
#include "operations/job/exceptions.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/nspio/warning.h"

#include <fmt/format.h>

#include <algorithm>
#include <filesystem>

namespace krv::operations::detail
{

using namespace krv::datasources;

namespace
{

bool EqualNames(const std::string& first, const std::string& second)
{
    return krv::ToUpper(first) == krv::ToUpper(second);
}

// By the extension of the file's name when the user names no format. A name whose extension belongs to none is refused:
// a file of another kind under it would deceive every other program.
std::string ChooseFormat(const TargetForm& oForm)
{
    const DatasetManager& oManager = *DatasetManager::GetInstance();
    const std::string extension = std::filesystem::path(oForm.name).extension().string();
    std::string format = extension.size() < 2 ? "TIF" : "";
    std::string all;
    bool bKnown = oForm.format.empty();
    for (const IFileFormat* const poFormat : oManager.GetFormatList())
    {
        for (const std::string& own : poFormat->GetExtensions())
        {
            if (oForm.format.empty() && EqualNames("." + own, extension))
                format = poFormat->GetShortName();
        }
        bKnown = bKnown || EqualNames(poFormat->GetShortName(), oForm.format);
        all += (all.empty() ? "" : ", ") + poFormat->GetShortName();
    }
    if (!bKnown)
        throw RequestException(fmt::format("there is no format {}; there are {}", oForm.format, all), "format");
    if (oForm.format.empty() && format.empty())
        throw RequestException(fmt::format("{}: no format has the extension {}; name the file otherwise, or choose one "
                                           "of the formats {}{}",
                                           oForm.name, extension, all,
                                           EqualNames(extension, ".png") ? "; pictures are made by quick looks" : ""),
                               "format");
    if (!oForm.format.empty())
        format = krv::ToUpper(oForm.format);
    if (!oManager.GetCapabilities(format).IsSupported(CAPABILITY_CREATE))
        throw RequestException(fmt::format("{}: the format {} cannot create files; choose another", oForm.name, format),
                               "format");
    return format;
}

} // namespace

void Target::Warn(const std::string& message)
{
    krv::nspio::Warning::Warn(message);
}

Target::Target(const TargetLayout& oLayout, const TargetForm& oForm, const Progress& oProgress,
               krv::threading::IExecutor* poExecutor)
    : moName(oForm.name), moFormat(ChooseFormat(oForm)), moLayout(oLayout), moProgress(oProgress),
      mpoExecutor(poExecutor), mbChecked(oForm.check), mbNew(!std::filesystem::exists(oForm.name))
{
    MakeByUser(oForm, oForm.options);
}

Target::Target(const CopyPlan& oPlan, const TargetForm& oForm, const Progress& oProgress,
               krv::threading::IExecutor* poExecutor)
    : moName(oForm.name),
      moFormat(ChooseFormat(oForm)), moLayout{oPlan.GetWindow().width, oPlan.GetWindow().height, oPlan.GetTypes()},
      moProgress(oProgress), mpoExecutor(poExecutor), mbChecked(oForm.check),
      mbNew(!std::filesystem::exists(oForm.name))
{
    if (const auto oMoved = FindMovedForm(oPlan, oForm.options))
    {
        MakeByUser(oForm, WithoutForm(oForm.options));
        auto* const poBlocks = Find<IEncodedBlocks>();
        mbTakesBlocks = poBlocks != nullptr && poBlocks->SetEncodedForm(1, *oMoved);
    }
    if (!mbTakesBlocks)
        MakeLikeSource(oPlan, oForm);
}

bool Target::IsLossy() const
{
    const auto* const poNew = Find<INewFileDataset>();
    return poNew != nullptr && !poNew->KeepsPixels();
}

void Target::Make(const std::string& options)
{
    // The one before goes first: both have the same name. It was a trial, of which nothing is lost.
    if (Find<INewFileDataset>() != nullptr)
        mpoDataset->Delete();
    moStoring.reset();
    mpoDataset.reset();
    mpoDataset.reset(DatasetManager::GetInstance()->NewDataset(moName, moFormat, options));
    // A file that another program makes meanwhile is not replaced.
    if (auto* const poNew = Find<INewFileDataset>(); poNew != nullptr && mbNew)
        poNew->KeepExisting();
    mpoRaster = dynamic_cast<IRasterDataset*>(mpoDataset.get());
    if (mpoRaster == nullptr)
        throw krv::DataException(moName + ": the format does not hold images");
    mpoRaster->Create(moLayout.width, moLayout.height, moLayout.types);
    moStoring.emplace(*mpoDataset, moProgress);
}

bool Target::TryMake(const std::string& options)
{
    try
    {
        Make(options);
        return true;
    }
    catch (const krv::DataException&)
    {
        return false;
    }
}

// What a format holds against the options that it was given is a matter of the command line.
void Target::MakeByUser(const TargetForm& oForm, const std::string& options)
{
    const auto& oTypes = moLayout.types;
    const bool bMixed =
        std::any_of(oTypes.begin(), oTypes.end(), [&](const auto& oType) { return oType != oTypes.front(); });
    try
    {
        Make(options);
    }
    catch (const krv::DataException& oError)
    {
        if (bMixed)
            throw RequestException(oError.GetMessage() + "; give all channels one type", "type");
        if (oForm.options.empty())
            throw;
        throw RequestException(oError.GetMessage(), "options");
    }
}

void Target::MakeLikeSource(const CopyPlan& oPlan, const TargetForm& oForm)
{
    std::vector<KeptOption> oKept = FindKeptOptions(oPlan, oForm.options);
    const auto Joined = [](const std::string& first, const std::string& second)
    {
        return first + (first.empty() ? "" : " ") + second;
    };
    std::string options = oForm.options;
    std::vector<std::string> oLeft;
    if (!DatasetManager::GetInstance()->GetCapabilities(moFormat).IsSupported(CAPABILITY_NARROW_SAMPLES))
        std::erase_if(oKept,
                      [&oLeft](const KeptOption& oOption)
                      {
                          const bool bNarrow = oOption.options.starts_with("NBITS=");
                          if (bNarrow)
                              oLeft.push_back(oOption.what);
                          return bNarrow;
                      });
    std::string all = options;
    for (const KeptOption& oOption : oKept)
        all = Joined(all, oOption.options);
    bool bMade = !oKept.empty() && TryMake(all);
    for (std::size_t nAt = 0; nAt < oKept.size() && !bMade; ++nAt)
    {
        const KeptOption& oOption = oKept[nAt];
        if (TryMake(Joined(options, oOption.options)))
        {
            options = Joined(options, oOption.options);
            continue;
        }
        if (!oOption.what.empty())
            oLeft.push_back(oOption.what);
        if (!oOption.instead.empty() && TryMake(Joined(options, oOption.instead)))
            options = Joined(options, oOption.instead);
    }
    if (!bMade)
        MakeByUser(oForm, options);
    const auto oForms = FindForm(oPlan.GetSource(0));
    const bool bAsked = ParseOptions(oForm.options).contains("COMPRESS");
    if (oForms && oForms->mbLossy && !bAsked)
        oLeft.insert(oLeft.begin(),
                     fmt::format("compression {} (its pixels are stored without further loss)", oForms->moCodec));
    if (!oLeft.empty())
        Warn(fmt::format("{}: not kept of {}: {}", moName, oPlan.GetSource(0).GetName(), fmt::join(oLeft, ", ")));
}

} // namespace krv::operations::detail
