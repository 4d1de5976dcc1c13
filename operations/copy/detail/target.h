#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "operations/copy/detail/copyplan.h"
#include "operations/job/progress.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/threading/executor.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::operations::detail
{

// Size and channels of a new file.
struct TargetLayout
{
    unsigned int width = 0;
    unsigned int height = 0;
    std::vector<krv::gobs::DataType> types;
};

// The new file while it is being made. What is not finished goes with it.
class Target
{
public:
    // Lays the file out as the user's options say and, where they are silent, as the first source is. Warns of what the
    // format does not keep of that.
    Target(const CopyPlan& oPlan, const TargetForm& oForm, const Progress& oProgress,
           krv::threading::IExecutor* poExecutor);

    // Lays the file out as the user's options say, and where they are silent as the format does.
    Target(const TargetLayout& oLayout, const TargetForm& oForm, const Progress& oProgress,
           krv::threading::IExecutor* poExecutor);

    template <typename Facet>
    Facet* Find() const
    {
        return dynamic_cast<Facet*>(mpoDataset.get());
    }
    krv::datasources::IDataset& Get() const { return *mpoDataset; }
    krv::datasources::IRasterDataset& GetRaster() const { return *mpoRaster; }
    const std::string& GetName() const { return moName; }
    // Whom its making is told.
    const Progress& GetProgress() const { return moProgress; }
    // Whose threads take part; may be null.
    krv::threading::IExecutor* GetExecutor() const { return mpoExecutor; }
    // Whether blocks that move as bytes are decoded, too.
    bool IsChecked() const { return mbChecked; }

    // Whether the blocks of the image are to come from the source as bytes.
    bool TakesBlocks() const { return mbTakesBlocks; }
    // Whether its pixels are others than those that are written.
    bool IsLossy() const;

    // What this format cannot keep is told, not taken for a failure: the pixels are the copy.
    template <typename Action>
    void Try(const std::string& what, Action oAction) const
    {
        try
        {
            oAction();
        }
        catch (const krv::DataException& oError)
        {
            Warn(what + " is not kept: " + oError.GetMessage());
        }
    }
    static void Warn(const std::string& message);

private:
    void Make(const std::string& options);
    void MakeByUser(const TargetForm& oForm, const std::string& options);
    bool TryMake(const std::string& options);
    void MakeLikeSource(const CopyPlan& oPlan, const TargetForm& oForm);

    std::string moName;
    std::string moFormat;
    TargetLayout moLayout;
    Progress moProgress;
    krv::threading::IExecutor* mpoExecutor;
    bool mbChecked;
    bool mbNew; // nothing had the name before
    std::unique_ptr<krv::datasources::IDataset> mpoDataset;
    std::optional<StoringProgress> moStoring;
    krv::datasources::IRasterDataset* mpoRaster = nullptr;
    bool mbTakesBlocks = false;
};

} // namespace krv::operations::detail
