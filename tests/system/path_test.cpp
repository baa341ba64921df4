#include <ostrand/system/File.h>

#include <gtest/gtest.h>

#include <tuple>

using namespace ostrand;
using S = const wchar_t*;

// clang-format off
static std::string Show(S p) { return p == NULL ? "(null) " : "[" + std::string(p, p + wcslen(p)) + "] "; }

TEST(CFilePathTest, MakePath)
{
    const std::tuple<S, S, S, S, S> rows[] = {
        {L"C:", L"data/logs\\", L"today", L"txt", L"C:\\data\\logs\\today.txt"}, {NULL, NULL, L"a", L".b", L"a.b"},
        {NULL, NULL, L"a", L"", L"a"}, {NULL, NULL, NULL, NULL, L""}, {L"", L"", L"", L"", L""}, {L"C:", NULL, NULL, NULL, L"C:"},
        {NULL, L"a.b/c.d/", L"x.y", L"z", L"a.b\\c.d\\x.y.z"}, {NULL, L"a\\\\\\b", L"c", NULL, L"a\\b\\c"},
        // Every run of backslashes becomes one, so a network share loses its leading pair.
        {NULL, L"\\\\server\\share", L"f", L"txt", L"\\server\\share\\f.txt"}, {NULL, L"//server/share/", L"f", NULL, L"\\server\\share\\f"},
    };
    for (const auto& [drive, dir, fname, ext, expected] : rows)
    {
        ustring path(L"previous content");
        CFile::MakePath(path, drive, dir, fname, ext);
        EXPECT_EQ(ustring(expected), path) << Show(drive) << Show(dir) << Show(fname) << Show(ext);
    }
}

TEST(CFilePathTest, SplitPath)
{
    const std::tuple<S, S, S, S, S> rows[] = {
        {L"C:\\data\\logs\\today.txt", L"C:", L"\\data\\logs\\", L"today", L".txt"}, {L"archive.tar.gz", L"", L"", L"archive.tar", L".gz"},
        {L"C:\\data.d\\file", L"C:", L"\\data.d\\", L"file", L""}, {L"C:", L"C:", L"", L"", L""}, {L"C:file.txt", L"C:", L"", L"file", L".txt"},
        {L"\\\\server\\share\\f.txt", L"", L"\\\\server\\share\\", L"f", L".txt"}, {L"//server/share/", L"", L"\\\\server\\share\\", L"", L""},
        {L".hidden", L"", L"", L"", L".hidden"}, {L"", L"", L"", L"", L""}, {NULL, L"", L"", L"", L""},
    };
    for (const auto& [path, drive, dir, fname, ext] : rows)
    {
        ustring p[4] = {L"x", L"x", L"x", L"x"};
        CFile::SplitPath(path, p[0], p[1], p[2], p[3]);
        EXPECT_EQ(ustring(drive) + L"|" + dir + L"|" + fname + L"|" + ext, p[0] + L"|" + p[1] + L"|" + p[2] + L"|" + p[3]) << Show(path);
    }
}

TEST(CFilePathTest, UpdateFileName)
{
    const std::tuple<S, S, S> rows[] = {
        {L"C:\\a\\b.txt", L"c.dat", L"C:\\a\\c.dat"}, {L"", L"c.dat", L"c.dat"}, {NULL, L"c.dat", L"c.dat"}, {NULL, NULL, L""},
        {L"b.txt", L"c", L"c"}, {L"C:/a/b.txt", L"sub/c.dat", L"C:\\a\\sub\\c.dat"}, {L"C:\\a.d\\b", L"c", L"C:\\a.d\\c"},
        {L"\\\\server\\share\\b.txt", L"c", L"\\server\\share\\c"},
        // The drive and an empty folder are joined by a separator: a drive-relative name becomes rooted.
        {L"C:b.txt", L"c", L"C:\\c"},
    };
    for (const auto& [path, newName, expected] : rows)
    {
        ustring result(L"previous content");
        CFile::UpdateFileName(path, newName, result);
        EXPECT_EQ(ustring(expected), result) << Show(path) << Show(newName);
    }
}

TEST(CFilePathTest, IsParentFolder)
{
    const std::tuple<S, S, bool> rows[] = {
        {L"C:\\Data\\x", L"c:/data/", true}, {L"C:\\data", L"C:\\data\\x", false}, {L"C:\\data", L"C:\\DATA\\", true},
        {L"C:\\data\\x", L"D:\\data", false}, {L"C:\\data\\x", L"C:", true}, {L"C:\\data.d\\x", L"C:\\data", false},
        {L"//server/share/x", L"\\\\SERVER\\share\\", true}, {L"C:\\a\\\\b", L"C:\\a\\b", false},
        // A share and a rooted folder of the same name are different places.
        {L"\\\\server\\share\\x", L"\\server\\share", false},
        // An empty folder has no components, so it is everyone's parent; an empty path has none to offer.
        {L"C:\\data", L"", true}, {L"C:\\data", NULL, true}, {L"", L"C:", false}, {NULL, L"C:", false},
    };
    for (const auto& [path, folder, expected] : rows)
        EXPECT_EQ(expected, CFile::IsParentFolder(path, folder)) << Show(path) << Show(folder);
}
// clang-format on
