#include "tools/krv/application.h"

int main(int nArguments, char** pArguments)
{
    return krv::tool::RunApplication(nArguments, pArguments);
}
