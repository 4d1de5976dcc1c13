#include "toolkit/xml/xmlutil.h"

#include <xalanc/XPath/XPathEvaluator.hpp>
#include <xalanc/XalanSourceTree/XalanSourceTreeInit.hpp>
#include <xercesc/framework/MemoryManager.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/PlatformUtils.hpp>

#include <cstdlib>
#include <memory>
#include <mutex>

namespace
{

// Exceptions of the XML library free their texts through the memory manager, so this one outlives every start and end.
class PermanentMemory : public xercesc::MemoryManager
{
public:
    xercesc::MemoryManager* getExceptionMemoryManager() override { return this; }

    void* allocate(XMLSize_t nBytes) override
    {
        void* poMemory = std::malloc(nBytes > 0 ? nBytes : 1);
        if (poMemory == nullptr)
            throw xercesc::OutOfMemoryException();
        return poMemory;
    }

    void deallocate(void* poMemory) override { std::free(poMemory); }
};

struct XmlState
{
    std::mutex moMutex; // guards the members below and every start and end
    unsigned int mnUsers = 0;
    PermanentMemory moMemory;
    std::unique_ptr<xalanc::XalanSourceTreeInit> mpoSourceTree;
};

XmlState& GetState()
{
    static auto* poState = new XmlState;
    return *poState;
}

void Start(XmlState& oState)
{
    xercesc::XMLPlatformUtils::Initialize(xercesc::XMLUni::fgXercescDefaultLocale, nullptr, nullptr, &oState.moMemory);
    xalanc::XPathEvaluator::initialize();
    oState.mpoSourceTree = std::make_unique<xalanc::XalanSourceTreeInit>();
}

void End(XmlState& oState)
{
    oState.mpoSourceTree.reset();
    xalanc::XPathEvaluator::terminate();
    xercesc::XMLPlatformUtils::Terminate();
}

} // namespace

void KRV_XMLUtil::Initialize()
{
    XmlState& oState = GetState();
    const std::lock_guard oLock(oState.moMutex);
    if (oState.mnUsers == 0)
        Start(oState);
    ++oState.mnUsers;
}

void KRV_XMLUtil::Terminate()
{
    XmlState& oState = GetState();
    const std::lock_guard oLock(oState.moMutex);
    if (oState.mnUsers == 0 || --oState.mnUsers > 0)
        return;
    End(oState);
}

namespace krv::xml
{

XmlSession::XmlSession()
{
    KRV_XMLUtil::Initialize();
}

XmlSession::~XmlSession()
{
    KRV_XMLUtil::Terminate();
}

} // namespace krv::xml
