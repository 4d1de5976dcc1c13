#include "tools/samplescene/scenewriter.h"

#include <CLI/CLI.hpp>

#include <cstdio>
#include <exception>
#include <filesystem>

int main(int nArguments, char** pArguments)
{
    krv::samplescene::Options oOptions;
    CLI::App oApp("Makes a sample scene: rgb.tif (three 8-bit channels) and pan.tif (one 16-bit channel) on one grid,\n"
                  "over fractal terrain, with a UTM reference system and no-data around the turned footprint.");
    oApp.add_option("OUTDIR", oOptions.folder, "Folder to write into; it is made when it is not there")->required();
    oApp.add_option("--size", oOptions.size, "Width and height in pixels (4096)")->check(CLI::Range(64, 65536));
    oApp.add_option("--seed", oOptions.seed, "Another number gives another landscape (7)");
    try
    {
        oApp.parse(nArguments, pArguments);
    }
    catch (const CLI::ParseError& oError)
    {
        return oApp.exit(oError) == 0 ? 0 : 2;
    }
    try
    {
        std::filesystem::create_directories(oOptions.folder);
        krv::samplescene::WriteScene(oOptions);
    }
    catch (const std::exception& oError)
    {
        std::fprintf(stderr, "krv-samplescene: %s\n", oError.what());
        return 1;
    }
    std::printf("%s/rgb.tif\n%s/pan.tif\n", oOptions.folder.c_str(), oOptions.folder.c_str());
    return 0;
}
