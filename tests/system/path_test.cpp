#include <ostrand/system/File.h>
#include <gtest/gtest.h>
#include <utility>

using namespace ostrand;
using S = const wchar_t*;

// clang-format off
// Each function's result as text, computed into a string that held something before.
static ustring Make(S drive, S dir, S fname, S ext) { ustring p(L"old"); return CFile::MakePath(p, drive, dir, fname, ext), p; }
static ustring Update(S path, S name) { ustring p(L"old"); return CFile::UpdateFileName(path, name, p), p; }
static ustring Parent(S path, S folder) { return ustring(CFile::IsParentFolder(path, folder) ? L"parent" : L"not"); }
static ustring Split(S path)
{
    ustring p[4] = {L"x", L"x", L"x", L"x"};
    return CFile::SplitPath(path, p[0], p[1], p[2], p[3]), p[0] + L"|" + p[1] + L"|" + p[2] + L"|" + p[3];
}

TEST(CFilePathTest, MakePathSplitPathUpdateFileNameAndIsParentFolder)
{
    const std::pair<ustring, S> rows[] = {
        {Make(L"C:", L"data/logs\\", L"today", L"txt"), L"C:\\data\\logs\\today.txt"}, {Make(NULL, NULL, L"a", L".b"), L"a.b"},
        {Make(NULL, NULL, L"a", L""), L"a"}, {Make(NULL, NULL, NULL, NULL), L""}, {Make(L"", L"", L"", L""), L""}, {Make(L"C:", NULL, NULL, NULL), L"C:"},
        {Make(NULL, L"a.b/c.d/", L"x.y", L"z"), L"a.b\\c.d\\x.y.z"}, {Make(NULL, L"a\\\\\\b", L"c", NULL), L"a\\b\\c"},
        // Every run of backslashes becomes one, so a network share loses its leading pair.
        {Make(NULL, L"\\\\server\\share", L"f", L"txt"), L"\\server\\share\\f.txt"}, {Make(NULL, L"//server/share/", L"f", NULL), L"\\server\\share\\f"},
        {Split(L"C:\\data\\logs\\today.txt"), L"C:|\\data\\logs\\|today|.txt"}, {Split(L"archive.tar.gz"), L"||archive.tar|.gz"},
        {Split(L"C:\\data.d\\file"), L"C:|\\data.d\\|file|"}, {Split(L"C:"), L"C:|||"}, {Split(L"C:file.txt"), L"C:||file|.txt"},
        {Split(L"\\\\server\\share\\f.txt"), L"|\\\\server\\share\\|f|.txt"}, {Split(L"//server/share/"), L"|\\\\server\\share\\||"},
        {Split(L".hidden"), L"|||.hidden"}, {Split(L""), L"|||"}, {Split(NULL), L"|||"},
        {Update(L"C:\\a\\b.txt", L"c.dat"), L"C:\\a\\c.dat"}, {Update(L"", L"c.dat"), L"c.dat"}, {Update(NULL, L"c.dat"), L"c.dat"},
        {Update(NULL, NULL), L""}, {Update(L"b.txt", L"c"), L"c"}, {Update(L"C:/a/b.txt", L"sub/c.dat"), L"C:\\a\\sub\\c.dat"},
        {Update(L"C:\\a.d\\b", L"c"), L"C:\\a.d\\c"}, {Update(L"\\\\server\\share\\b.txt", L"c"), L"\\server\\share\\c"},
        // The drive and an empty folder are joined by a separator: a drive-relative name becomes rooted.
        {Update(L"C:b.txt", L"c"), L"C:\\c"},
        {Parent(L"C:\\Data\\x", L"c:/data/"), L"parent"}, {Parent(L"C:\\data", L"C:\\data\\x"), L"not"}, {Parent(L"C:\\data", L"C:\\DATA\\"), L"parent"},
        {Parent(L"C:\\data\\x", L"D:\\data"), L"not"}, {Parent(L"C:\\data\\x", L"C:"), L"parent"}, {Parent(L"C:\\data.d\\x", L"C:\\data"), L"not"},
        {Parent(L"//server/share/x", L"\\\\SERVER\\share\\"), L"parent"}, {Parent(L"C:\\a\\\\b", L"C:\\a\\b"), L"not"},
        // A share and a rooted folder of the same name are different places.
        {Parent(L"\\\\server\\share\\x", L"\\server\\share"), L"not"},
        // An empty folder has no components, so it is everyone's parent; an empty path has none to offer.
        {Parent(L"C:\\data", L""), L"parent"}, {Parent(L"C:\\data", NULL), L"parent"}, {Parent(L"", L"C:"), L"not"}, {Parent(NULL, L"C:"), L"not"},
    };
    // clang-format on
    for (size_t i = 0; i < sizeof rows / sizeof rows[0]; ++i)
        EXPECT_EQ(ustring(rows[i].second), rows[i].first) << "row " << i;
}
