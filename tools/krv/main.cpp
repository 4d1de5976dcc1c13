#include "tools/krv/application.h"

#include <csignal>

int main(int nArguments, char** pArguments)
{
    std::signal(SIGXFSZ, SIG_IGN); // a limit on the size of files is told as an error
    return krv::tool::RunApplication(nArguments, pArguments);
}
