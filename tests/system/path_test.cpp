#include <ostrand/system/File.h>

#include <gtest/gtest.h>

using namespace ostrand;

namespace
{
ustring Text(const wchar_t* p)
{
    return p == NULL ? ustring(L"(null)") : ustring(p);
}
} // namespace

// MakePath ----------------------------------------------------------------------------------------------

TEST(CFileMakePathTest, Table)
{
    struct Row
    {
        const wchar_t* drive;
        const wchar_t* dir;
        const wchar_t* fname;
        const wchar_t* ext;
        const wchar_t* expected;
    };
    const Row rows[] = {
        {L"C:", L"data/logs\\", L"today", L"txt", L"C:\\data\\logs\\today.txt"},
        {NULL, NULL, L"a", L".b", L"a.b"},
        {NULL, NULL, L"a", L"b", L"a.b"},
        {NULL, NULL, L"a", L"", L"a"},
        {NULL, NULL, L"a", NULL, L"a"},
        {NULL, NULL, NULL, NULL, L""},
        {L"", L"", L"", L"", L""},
        {L"C:", NULL, NULL, NULL, L"C:"},
        {L"C:", L"", L"f", NULL, L"C:\\f"},
        {L"C:", L"\\dir\\", L"f", L"x", L"C:\\dir\\f.x"},
        {L"D:", L"dir", NULL, NULL, L"D:\\dir"},
        {NULL, L"dir", L"f", L"txt", L"dir\\f.txt"},
        {NULL, L"dir\\", L"f", NULL, L"dir\\f"},
        {NULL, L"dir", NULL, L"txt", L"dir.txt"},
        {NULL, L"dir", L"", L"txt", L"dir\\.txt"},
        {NULL, L"a.b/c.d/", L"x.y", L"z", L"a.b\\c.d\\x.y.z"},
        {NULL, NULL, L"a//b", L"c", L"a\\b.c"},
        {NULL, L"a\\\\\\b", L"c", NULL, L"a\\b\\c"},
        {NULL, L"/", L"root", NULL, L"\\root"},
        {NULL, NULL, L"name", L"..", L"name.."},
        // A network share loses its leading pair: every run of backslashes becomes one.
        {NULL, L"\\\\server\\share", L"f", L"txt", L"\\server\\share\\f.txt"},
        {NULL, L"//server/share/", L"f", NULL, L"\\server\\share\\f"},
        {L"\\\\server", L"share", L"f", NULL, L"\\server\\share\\f"},
    };
    for (const Row& r : rows)
    {
        ustring path(L"previous content");
        CFile::MakePath(path, r.drive, r.dir, r.fname, r.ext);
        EXPECT_EQ(ustring(r.expected), path)
            << "drive " << Text(r.drive).c_str() << " dir " << Text(r.dir).c_str() << " fname "
            << Text(r.fname).c_str() << " ext " << Text(r.ext).c_str();
    }
}

// SplitPath ---------------------------------------------------------------------------------------------

TEST(CFileSplitPathTest, Table)
{
    struct Row
    {
        const wchar_t* path;
        const wchar_t* drive;
        const wchar_t* dir;
        const wchar_t* fname;
        const wchar_t* ext;
    };
    const Row rows[] = {
        {L"C:\\data\\logs\\today.txt", L"C:", L"\\data\\logs\\", L"today", L".txt"},
        {L"archive.tar.gz", L"", L"", L"archive.tar", L".gz"},
        {L"C:\\data.d\\file", L"C:", L"\\data.d\\", L"file", L""},
        {L"name", L"", L"", L"name", L""},
        {L"C:", L"C:", L"", L"", L""},
        {L"C:/a/b.c", L"C:", L"\\a\\", L"b", L".c"},
        {L"C:file.txt", L"C:", L"", L"file", L".txt"},
        {L"\\\\server\\share\\f.txt", L"", L"\\\\server\\share\\", L"f", L".txt"},
        {L"//server/share/", L"", L"\\\\server\\share\\", L"", L""},
        {L"dir\\", L"", L"dir\\", L"", L""},
        {L"a.b\\c", L"", L"a.b\\", L"c", L""},
        {L".hidden", L"", L"", L"", L".hidden"},
        {L"dir\\file.", L"", L"dir\\", L"file", L"."},
        {L"\\", L"", L"\\", L"", L""},
        {L"", L"", L"", L"", L""},
        {NULL, L"", L"", L"", L""},
    };
    for (const Row& r : rows)
    {
        ustring drive(L"x"), dir(L"x"), fname(L"x"), ext(L"x");
        CFile::SplitPath(r.path, drive, dir, fname, ext);
        const ustring shown = Text(r.path);
        const std::string where = "path " + std::string(shown.begin(), shown.end());
        EXPECT_EQ(ustring(r.drive), drive) << where;
        EXPECT_EQ(ustring(r.dir), dir) << where;
        EXPECT_EQ(ustring(r.fname), fname) << where;
        EXPECT_EQ(ustring(r.ext), ext) << where;
    }
}

TEST(CFileSplitPathTest, PiecesJoinBackToTheNormalisedPath)
{
    const wchar_t* paths[] = {L"C:\\data\\logs\\today.txt", L"C:/x/y.z", L"rel\\a.b\\c.d", L"file"};
    for (const wchar_t* p : paths)
    {
        ustring drive, dir, fname, ext, joined;
        CFile::SplitPath(p, drive, dir, fname, ext);
        CFile::MakePath(joined, drive.empty() ? NULL : drive.c_str(), dir.empty() ? NULL : dir.c_str(), fname,
                        ext);
        ustring expected(p);
        for (size_t i = 0; i < expected.size(); ++i)
            if (expected[i] == L'/')
                expected[i] = L'\\';
        EXPECT_EQ(expected, joined);
    }
}

// UpdateFileName ----------------------------------------------------------------------------------------

TEST(CFileUpdateFileNameTest, Table)
{
    struct Row
    {
        const wchar_t* path;
        const wchar_t* newName;
        const wchar_t* expected;
    };
    const Row rows[] = {
        {L"C:\\a\\b.txt", L"c.dat", L"C:\\a\\c.dat"},
        {L"", L"c.dat", L"c.dat"},
        {NULL, L"c.dat", L"c.dat"},
        {NULL, NULL, L""},
        {L"b.txt", L"c", L"c"},
        {L"C:/a/b.txt", L"c.dat", L"C:\\a\\c.dat"},
        {L"C:\\a\\dir\\", L"x", L"C:\\a\\dir\\x"},
        {L"C:\\a\\b.txt", L"sub/c.dat", L"C:\\a\\sub\\c.dat"},
        {L"C:\\a.d\\b", L"c", L"C:\\a.d\\c"},
        {L"C:\\a\\b.txt", L"", L"C:\\a\\"},
        {L"\\\\server\\share\\b.txt", L"c", L"\\server\\share\\c"},
        // The drive and an empty folder are joined by a separator, so a drive-relative name becomes
        // rooted.
        {L"C:b.txt", L"c", L"C:\\c"},
    };
    for (const Row& r : rows)
    {
        ustring result(L"previous content");
        CFile::UpdateFileName(r.path, r.newName, result);
        EXPECT_EQ(ustring(r.expected), result) << "path " << Text(r.path).c_str();
    }
}

// IsParentFolder ----------------------------------------------------------------------------------------

TEST(CFileIsParentFolderTest, Table)
{
    struct Row
    {
        const wchar_t* path;
        const wchar_t* folder;
        bool expected;
    };
    const Row rows[] = {
        {L"C:\\Data\\x", L"c:/data/", true},
        {L"C:\\data", L"C:\\data\\x", false},
        {L"C:\\data\\x", L"C:\\dat", false},
        {L"C:\\data\\x", L"C:\\data", true},
        {L"C:\\data", L"C:\\data", true},
        {L"C:\\data\\", L"C:\\DATA", true},
        {L"C:\\DATA\\Sub\\f.txt", L"c:\\data\\sub", true},
        {L"C:\\data\\x", L"D:\\data", false},
        {L"C:\\data\\x", L"C:", true},
        {L"C:\\data.d\\x", L"C:\\data", false},
        {L"\\\\server\\share\\x", L"\\\\server\\share", true},
        {L"//server/share/x", L"\\\\SERVER\\share\\", true},
        {L"\\\\server\\share\\x", L"\\\\server\\other", false},
        // A share and a rooted folder of the same name are different places.
        {L"\\\\server\\share\\x", L"\\server\\share", false},
        // Empty components inside count: a doubled separator is not the same path.
        {L"C:\\a\\\\b", L"C:\\a\\b", false},
        {L"rel\\a\\b", L"rel\\a", true},
        {L"\\rel\\a", L"rel", false},
        // An empty folder has no components, so it is everyone's parent; an empty path has none to offer.
        {L"C:\\data", L"", true},
        {L"C:\\data", NULL, true},
        {L"", L"C:", false},
        {NULL, L"C:", false},
        {NULL, NULL, true},
    };
    for (const Row& r : rows)
        EXPECT_EQ(r.expected, CFile::IsParentFolder(r.path, r.folder))
            << "path " << Text(r.path).c_str() << " folder " << Text(r.folder).c_str();
}
