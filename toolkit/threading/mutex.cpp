#include "toolkit/threading/mutex.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::threading
{

void Mutex::lock()
{
    if (const int nError = pthread_mutex_lock(&moHandle); nError != 0)
        throw krv::OSException(nError, "Cannot lock a mutex");
}

bool Mutex::try_lock()
{
    return pthread_mutex_trylock(&moHandle) == 0;
}

void Mutex::unlock()
{
    pthread_mutex_unlock(&moHandle);
}

} // namespace krv::threading
