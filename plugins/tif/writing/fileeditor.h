#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/file/roomrecord.h"
#include "plugins/support/file/scratch.h"
#include "plugins/support/file/space.h"
#include "plugins/support/writing/filewriter.h"
#include "plugins/tif/reading/page.h"
#include "plugins/tif/writing/pagemodel.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

class PageWriter;

// A strip or tile by its number, and where a file has its bytes.
struct CodedStrile
{
    std::uint64_t mnNumber = 0;
    std::uint64_t mnOffset = 0;
    std::uint64_t mnBytes = 0;
};

// A TIFF file that is being written. Its structure is kept here, in memory; blocks and directories are only ever added
// to the file, beside what its committed state uses. Synchronize writes the new directories and makes them the file's
// by changing one number: the place of the first directory. A file that is left at any moment is therefore as of the
// last Synchronize. One thread at a time.
class FileEditor : public support::FileWriter, public std::enable_shared_from_this<FileEditor>
{
public:
    class Operation;

    // For an existing file. Throws the kinds of FileException, for files that cannot be updated too.
    explicit FileEditor(const std::string& fileName);
    // For a new file, which is made by AddFirstPage.
    FileEditor(const std::string& fileName, const CreateOptions& oOptions);
    // Bytes that the state of a file which a header names leaves unused; no value when other programs may use them.
    static std::optional<std::uint64_t> CountUnusedBytes(std::shared_ptr<support::File> poFile,
                                                         const FileHeader& oHeader);
    ~FileEditor() override;

    const CreateOptions& GetOptions() const { return moOptions; }
    const FileHeader& GetHeader() const { return moHeader; }
    // Whether a new file was laid out.
    bool HasPages() const { return !moPages.empty(); }
    std::vector<PageSummary> Summarise() const;
    // The chain, then the pages that the first one lists.
    const std::vector<std::shared_ptr<PageModel>>& GetPages() const { return moPages; }
    const std::shared_ptr<PageModel>& GetPage(std::uint64_t nNumber, const Place& oPlace = Place::Current()) const;

    // Lays a new file out. Decides between classic and big.
    std::shared_ptr<PageModel> AddFirstPage(const NewImage& oImage, const Place& oPlace);
    // A page that nothing of is stored. Throws DataException when it has too many strips or tiles.
    void AddPage(std::shared_ptr<PageModel> poPage);
    // Back to before AddFirstPage.
    void Restart() noexcept;
    // The lists of strips and tiles for a page's tags, of nothing stored. Throws DataException when there are too many.
    void LayOut(PageModel& oPage, const Place& oPlace = Place::Current()) const;
    void RemovePage(std::uint64_t nNumber);
    // Puts a page in the place of the one with its number, of which it may have taken over strips and tiles.
    void ReplacePage(std::shared_ptr<PageModel> poPage);

    // The page as readers see it, with the tags of this moment. Throws FileFormatException for one that cannot be read
    // so, or that readers see in another size.
    std::shared_ptr<Page> OpenPage(const std::shared_ptr<PageModel>& poPage);
    // Brings the values of a tag into memory, and all of a page.
    void Load(Tag& oTag);
    void LoadTags(PageModel& oPage);

    // Stores the bytes of a strip or tile: in the place of the old ones when the committed state does not use that.
    void StoreStrile(PageModel& oPage, std::uint64_t nStrile, const unsigned char* pBytes, std::size_t nBytes);
    // The same of several, from another file and each in a new place: all of them, or none when it throws.
    void CopyStriles(PageModel& oPage, const support::File& oSource, const std::vector<CodedStrile>& oStriles);
    // Gives an uncompressed strip or tile a place of its own, with what it held, so that rows may be written into it.
    std::uint64_t OwnStrile(PageModel& oPage, std::uint64_t nStrile, std::size_t nBytes);

    // Writers of pages are asked to store what they hold back by Synchronize.
    void Register(const std::shared_ptr<PageWriter>& poWriter);

    // Stores what the writers hold back.
    void StoreHeld();

    // Bytes of the file that nothing uses; no value when other programs may.
    std::optional<std::uint64_t> GetUnusedBytes() const;

    // Whether anything changed since the last Synchronize; blocks that are held back do not count.
    bool IsChanged() const;
    // Lays the file out as its options say. Pages are of no use afterwards.
    void Finish() override;
    // What was added to an existing file since it was committed is cut off again.
    void Discard() noexcept override;

protected:
    void Store() override;
    bool HoldsChanges() const override;

private:
    static constexpr std::uint64_t MAXIMUM_STRILES = std::uint64_t{1} << 28;

    // A directory that was written and the places of what it names, until it is committed.
    struct Written
    {
        PageModel* mpPage = nullptr;
        Extent moDirectory;
        std::uint64_t mnNext = 0;
        Extent moOffsetArray;
        Extent moCountArray;
    };

    // Over a file that is open already; one that is open for reading only is looked at.
    FileEditor(std::shared_ptr<support::File> poFile, const std::optional<FileHeader>& oHeader);
    void ReadPages();
    // What nothing in the file names is unused where this library alone wrote.
    void FindUnused();
    std::vector<Extent> ListUsed() const;
    void ReadPage(std::uint64_t nOffset, bool bBelowFirst, std::uint64_t& nNext);
    void ReadStriles(PageModel& oPage, const RawDirectory& oDirectory);
    // Counts what the structure takes in memory. Throws FileFormatException when it is more than a sound file's.
    void Charge(std::uint64_t nBytes);
    void CreateFile(bool bBigTiff, bool bGap);
    void UseSpace(std::uint64_t nEnd);
    std::uint64_t GetReserve() const;
    // Records the new place of a strip or tile and releases the old one.
    void MoveStrile(PageModel& oPage, std::uint64_t nStrile, const Extent& oOld, const Extent& oNew,
                    std::size_t nBytes);
    Written WriteDirectory(PageModel& oPage, std::uint64_t nNext, bool bDraft);
    std::vector<Written> WriteDirectories();
    void Commit(const std::vector<Written>& oWritten);
    void Publish(const std::vector<Written>& oWritten);
    void MarkChanged();
    void ReleaseWritten(const std::vector<Written>& oWritten);
    void Adopt(const Written& oWritten);
    // pHeir: the page that takes its place, or null.
    void ReleasePage(const PageModel& oPage, const PageModel* pHeir);
    bool IsWasteful() const;
    [[noreturn]] void Fail(const std::string& what, const Place& oPlace = Place::Current()) const;

    CreateOptions moOptions;
    FileHeader moHeader;
    std::unique_ptr<support::Space> mpoSpace;
    std::vector<std::shared_ptr<PageModel>> moPages;
    std::vector<std::weak_ptr<PageWriter>> moWriters;
    std::uint64_t mnNextNumber = 1;
    std::uint64_t mnModelBytes = UINT64_MAX; // that the structure may still take
    std::uint64_t mnCloudBytes = 0;          // of the text for clients behind the header
    std::uint64_t mnBeforeBlock = 0;         // of the leader of each block
    std::uint64_t mnBehindBlock = 0;         // of its trailer
    bool mbMarked = false;                   // it says that the file was changed
    std::uint64_t mnCommittedSize = 0;       // of the file with all that its committed state may use
    std::vector<Extent> moReleased;          // of pages that are gone
    support::Scratch moScratch;              // for bytes on their way
    support::RoomRecord moRecord;            // that goes with the next state
    bool mbChanged = false;                  // pages came or went
    bool mbBelowFirst = false;               // the first page listed others when the file was opened
    bool mbOperation = false;                // one is under way
};

// An operation on the structure of a file: pages that come, go or get other tags. All of it is undone, in memory and in
// the room that it took, when it is not adopted. One that begins within another is a part of that one. Pixels of pages
// that were there before must not be stored meanwhile.
class FileEditor::Operation
{
public:
    explicit Operation(FileEditor& oEditor);
    ~Operation();
    Operation(const Operation&) = delete;
    Operation& operator=(const Operation&) = delete;

    void Adopt();

private:
    struct Saved
    {
        std::shared_ptr<PageModel> mpoPage;
        TagList moTags;
        Extent moDraft;
        bool mbStrilesChanged;
    };

    FileEditor& moEditor;
    bool mbOuter;
    bool mbAdopted = false;
    std::vector<Saved> moPages;
    std::size_t mnReleased;
    std::uint64_t mnModelBytes;
    bool mbChanged;
};

} // namespace krv::plugins::tif
