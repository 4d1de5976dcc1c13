#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/accessmode.h"
#include "toolkit/threading/mutex.h"

#include <map>
#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{

class FormatCapabilities;
class IDataset;
class IFileFormat;
class IFileIOBuilder;

// Knows every format and opens and creates datasets by file name. There is one in a process; the first GetInstance()
// makes it and loads the format libraries that the registry lists.
// Example: std::unique_ptr<IDataset> poFile(DatasetManager::GetInstance()->Open("scene.tif", eReadOnly));
// Open and NewDataset may be called by any thread; each dataset is one thread's at a time.
class KRV_DATASOURCES_API DatasetManager
{
public:
    // Any thread. When a format library or the registry is broken it throws what was found, keeps nothing, and the next
    // call tries again. A format library that calls it while it registers gets a DataException.
    static DatasetManager* GetInstance();

    // Ends the instance, if there is one; a later GetInstance() makes a new one. Takes no lock: no other thread may be
    // using the manager. Runs by itself at the end of the process.
    static void DestroyInstance();

    // Copies share builders, formats and cached capabilities; the last one releases them.
    DatasetManager(const DatasetManager& oOther);
    DatasetManager& operator=(const DatasetManager& oOther);
    ~DatasetManager();

    // Takes a builder over; when this throws it stays the caller's. xmlPath: the format's description file. Builders
    // registered as primary are asked before the others. Throws DataException for a null builder, one without a format
    // and a short name that is taken.
    void Register(IFileIOBuilder* poBuilder, const std::string& xmlPath, bool bPrimary);

    // Opens an existing file with the first builder that recognises it: the one that recognised the last file, then the
    // primary ones, then the others. The caller owns the result, which may be null when a builder returned null. Throws
    // FileNotFoundException when the file cannot be read, FileFormatException when nobody recognises it, both with an
    // empty message, and whatever the builder throws.
    // Recognising reads the file's first bytes alone; what is behind them is the format's affair.
    IDataset* Open(const std::string& fileName, AccessMode eMode);

    // Opens a file with the non-primary builder of one format. Null when there is none or it throws a krv::Exception.
    // Takes no lock.
    IDataset* OpenFormat(const std::string& shortName, const std::string& fileName, AccessMode eMode);

    // Creates a file of a type; types without a format of their own go to the generic builder with the type in the
    // options. A format that cannot create opens the existing file for update instead. The caller owns the result.
    // fileType: a short name, such as "TIF". options: KEY=VALUE separated by blanks. Throws DataException for an option
    // that is not known.
    IDataset* NewDataset(const std::string& fileName, const std::string& fileType, const std::string& options);

    // Whether Open succeeds; a builder that returns null counts as success, intended: it recognised the file.
    // Opens and closes the file: as costly as opening it.
    bool CanOpen(const std::string& fileName, AccessMode eMode);

    // The query is turned to upper case, registered names are not: a name with lower-case letters is never found here,
    // intended. Throws DataException for an unknown name.
    const IFileFormat* GetFormatByName(const std::string& shortName) const;

    // Every format in the order of registration.
    // Formats belong to their builders, which go with the manager.
    const std::vector<const IFileFormat*>& GetFormatList() const;

    // What a format can do; the name counts letter by letter. The manager keeps the result. Any thread.
    // Throws krv::Exception for an unknown name.
    const FormatCapabilities& GetCapabilities(const std::string& shortName) const;

private:
    struct Shared;
    using BuilderMap = std::map<const IFileFormat*, IFileIOBuilder*>;

    DatasetManager();

    IDataset* OpenLocked(const std::string& fileName, AccessMode eMode);
    IDataset* OpenRecognised(const std::string& name, const unsigned char* pHeader, AccessMode eMode, bool& bFound);
    IFileIOBuilder* FindBuilder(const BuilderMap& oBuilders, const std::string& name, const unsigned char* pHeader);
    IFileIOBuilder* FindBuilder(const IFileFormat* poFormat) const;
    // The caller holds the lock of the capabilities.
    std::string GetXMLPath(const std::string& shortName) const;
    bool FileExists(const std::string& fileName) const;

    // Builders, capabilities and the hold on XML support, shared by copies.
    std::shared_ptr<Shared> mpoShared;
    BuilderMap moPrimaryBuilders;
    BuilderMap moSecondaryBuilders;
    std::map<std::string, const IFileFormat*> moFormatsByName;
    std::map<std::string, std::string> moXmlPaths; // guarded like the capabilities, which any thread asks for
    std::vector<const IFileFormat*> moFormatList;
    IFileIOBuilder* mpoLastBuilder = nullptr;

    static DatasetManager* mpoManager;
    // Guards the instance and every other registry member; re-entrant, since format libraries register while
    // GetInstance runs and NewDataset calls Open.
    static krv::threading::Mutex moMutex;
};

} // namespace krv::datasources
