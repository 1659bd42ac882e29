// INI files the way other programs write them, with what INIReader makes of each.
#include "IniTestFile.h"

#include "KelvraIni.h"
#include "KelvraStrings.h"

#include <gtest/gtest.h>

#include <string>

using KelvraStrings::Strings;
using KelvraTest::IniTestFile;

namespace
{

INIReader Read(const std::string& bytes)
{
    IniTestFile file(bytes);
    return INIReader(file.Path());
}

} // namespace

TEST(IniDialect, WindowsWinIni)
{
    const INIReader reader = Read("; for 16-bit app support\r\n"
                                  "[fonts]\r\n"
                                  "[extensions]\r\n"
                                  "[mci extensions]\r\n"
                                  "[files]\r\n"
                                  "[Mail]\r\n"
                                  "MAPI=1\r\n"
                                  "CMCDLLNAME32=mapi32.dll\r\n"
                                  "CMC=1\r\n"
                                  "MAPIX=1\r\n"
                                  "MAPIXVER=1.0.0.1\r\n"
                                  "OLEMessaging=1\r\n"
                                  "[MCI Extensions.BAK]\r\n"
                                  "3g2=MPEGVideo\r\n"
                                  "aac=MPEGVideo\r\n"
                                  "m4v=MPEGVideo\r\n"
                                  "[Desktop]\r\n"
                                  "Wallpaper=C:\\Windows\\Web\\Wallpaper\\Windows\\img0.jpg\r\n"
                                  "TileWallpaper=0\r\n");
    EXPECT_EQ(reader.ParseError(), 0);
    EXPECT_TRUE(reader.GetBoolean(L"mail", L"mapi", false));
    EXPECT_EQ(reader.Get(L"Mail", L"CMCDLLNAME32", L""), L"mapi32.dll");
    EXPECT_EQ(reader.Get(L"Mail", L"MAPIXVER", L""), L"1.0.0.1");
    EXPECT_EQ(reader.GetReal(L"Mail", L"MAPIXVER", 0), 1.0);
    EXPECT_EQ(reader.Get(L"MCI Extensions.BAK", L"3g2", L""), L"MPEGVideo");
    EXPECT_EQ(reader.Get(L"mci extensions", L"bak.m4v", L""), L"MPEGVideo"); // the dot joins keys
    EXPECT_EQ(reader.Get(L"Desktop", L"Wallpaper", L""), L"C:\\Windows\\Web\\Wallpaper\\Windows\\img0.jpg");
    EXPECT_FALSE(reader.GetBoolean(L"Desktop", L"TileWallpaper", true));
}

TEST(IniDialect, WindowsSystemIni)
{
    const INIReader reader = Read("; for 16-bit app support\r\n"
                                  "[386Enh]\r\n"
                                  "woafont=dosapp.fon\r\n"
                                  "EGA80WOA.FON=EGA80WOA.FON\r\n"
                                  "EGA40WOA.FON=EGA40WOA.FON\r\n"
                                  "CGA80WOA.FON=CGA80WOA.FON\r\n"
                                  "CGA40WOA.FON=CGA40WOA.FON\r\n"
                                  "\r\n"
                                  "[drivers]\r\n"
                                  "wave=mmdrv.dll\r\n"
                                  "timer=timer.drv\r\n"
                                  "\r\n"
                                  "[mci]\r\n"
                                  "[boot]\r\n"
                                  "shell=Explorer.exe\r\n"
                                  "SCRNSAVE.EXE=\r\n");
    EXPECT_EQ(reader.ParseError(), 0);
    EXPECT_EQ(reader.Get(L"386enh", L"woafont", L""), L"dosapp.fon");
    EXPECT_EQ(reader.Get(L"386Enh", L"cga40woa.fon", L""), L"CGA40WOA.FON");
    EXPECT_EQ(reader.Get(L"drivers", L"timer", L""), L"timer.drv");
    EXPECT_EQ(reader.Get(L"boot", L"shell", L""), L"Explorer.exe");
    EXPECT_EQ(reader.Get(L"boot", L"SCRNSAVE.EXE", L"none"), L"none");
}

TEST(IniDialect, DesktopEntryInUtf8)
{
    const std::string russian = "\xD0\x92\xD0\xB5\xD0\xB1-\xD0\xB1\xD1\x80\xD0\xB0\xD1\x83\xD0\xB7\xD0\xB5\xD1\x80";
    const INIReader reader = Read("[Desktop Entry]\n"
                                  "Version=1.0\n"
                                  "Name=Firefox Web Browser\n"
                                  "Name[fr]=Navigateur Web Firefox\n"
                                  "GenericName[ru]=" + russian + "\n"
                                  "Comment=Browse the World Wide Web\n"
                                  "Exec=firefox %u\n"
                                  "Terminal=false\n"
                                  "X-MultipleArgs=false\n"
                                  "Type=Application\n"
                                  "Icon=firefox\n"
                                  "Categories=GNOME;GTK;Network;WebBrowser;\n"
                                  "MimeType=text/html;text/xml;application/xhtml+xml;\n"
                                  "StartupNotify=true\n"
                                  "Actions=new-window;new-private-window;\n"
                                  "\n"
                                  "[Desktop Action new-window]\n"
                                  "Name=Open a New Window\n"
                                  "Exec=firefox -new-window\n"
                                  "\n"
                                  "# A comment the way desktop files write them\n"
                                  "[Desktop Action new-private-window]\n"
                                  "Name=Open a New Private Window\n"
                                  "Exec=firefox -private-window\n");
    EXPECT_EQ(reader.ParseError(), 0);
    EXPECT_EQ(reader.Get(L"Desktop Entry", L"Name", L""), L"Firefox Web Browser");
    EXPECT_EQ(reader.Get(L"Desktop Entry", L"name[FR]", L""), L"Navigateur Web Firefox");
    EXPECT_EQ(reader.Get(L"Desktop Entry", L"GenericName[ru]", L""), Strings::ToString(russian)); // bytes, not decoded
    EXPECT_EQ(reader.Get(L"Desktop Entry", L"Exec", L""), L"firefox %u");
    EXPECT_EQ(reader.Get(L"Desktop Entry", L"Categories", L""), L"GNOME;GTK;Network;WebBrowser;");
    EXPECT_FALSE(reader.GetBoolean(L"Desktop Entry", L"Terminal", true));
    EXPECT_TRUE(reader.GetBoolean(L"Desktop Entry", L"StartupNotify", false));
    EXPECT_EQ(reader.GetReal(L"Desktop Entry", L"Version", 0), 1.0);
    EXPECT_EQ(reader.Get(L"Desktop Action new-private-window", L"Exec", L""), L"firefox -private-window");
}

TEST(IniDialect, GitConfigKeepsTheFirstIndentedKeyOfEachSection)
{
    // git indents its keys with a tab: after the first key of a section every indented line
    // continues that key's value, which already holds one, so only the first keys are stored.
    const INIReader reader = Read("[core]\n"
                                  "\trepositoryformatversion = 0\n"
                                  "\tfilemode = true\n"
                                  "\tbare = false\n"
                                  "[remote \"origin\"]\n"
                                  "\turl = https://example.com/team/project.git\n"
                                  "\tfetch = +refs/heads/*:refs/remotes/origin/*\n"
                                  "[branch \"main\"]\n"
                                  "\tremote = origin\n"
                                  "\tmerge = refs/heads/main\n"
                                  "[user]\n"
                                  "name = Ada Lovelace\n"
                                  "email = ada@example.com\n");
    EXPECT_EQ(reader.ParseError(), 0);
    EXPECT_EQ(reader.GetInteger(L"core", L"repositoryformatversion", -1), 0);
    EXPECT_EQ(reader.Get(L"core", L"filemode", L"none"), L"none");
    EXPECT_EQ(reader.Get(L"remote \"origin\"", L"url", L""), L"https://example.com/team/project.git");
    EXPECT_EQ(reader.Get(L"remote \"origin\"", L"fetch", L"none"), L"none");
    EXPECT_EQ(reader.Get(L"branch \"main\"", L"remote", L""), L"origin");
    EXPECT_EQ(reader.Get(L"user", L"name", L""), L"Ada Lovelace");
    EXPECT_EQ(reader.Get(L"user", L"email", L""), L"ada@example.com");
}

TEST(IniDialect, PhpConfigurationWithLongCommentBlocks)
{
    const std::string longComment = "; See https://www.php.net/manual/en/ini.list.php for " + std::string(220, '.') +
                                    " every directive (this line is longer than one read)\n";
    const INIReader reader = Read("[PHP]\n"
                                  "\n"
                                  ";;;;;;;;;;;;;;;;;;;\n"
                                  "; About php.ini   ;\n"
                                  ";;;;;;;;;;;;;;;;;;;\n"
                                  "; PHP's initialization file, generally called php.ini, is responsible for\n"
                                  "; configuring many of the aspects of PHP's behavior.\n"
                                  ";\n"
                                  "; The syntax of the file is extremely simple.  Whitespace and lines\n"
                                  "; beginning with a semicolon are silently ignored (as you probably guessed).\n"
                                  "; Section headers (e.g. [Foo]) are also silently ignored, even though\n"
                                  "; they might mean something in the future.\n" +
                                  longComment +
                                  ";;;;;;;;;;;;;;;;;;;;\n"
                                  "; Language Options ;\n"
                                  ";;;;;;;;;;;;;;;;;;;;\n"
                                  "\n"
                                  "; Enable the PHP scripting language engine under Apache.\n"
                                  "; https://php.net/engine\n"
                                  "engine = On\n"
                                  "short_open_tag = Off\n"
                                  "precision = 14\n"
                                  "output_buffering = 4096\n"
                                  "memory_limit = 128M\n"
                                  "error_reporting = E_ALL & ~E_DEPRECATED & ~E_STRICT\n"
                                  "display_errors = Off\n"
                                  ";extension=curl\n"
                                  "upload_max_filesize = 2M\n"
                                  "url_rewriter.tags = \"a=href,area=href,frame=src,form=\"\n"
                                  "\n"
                                  "[Date]\n"
                                  "; Defines the default timezone used by the date functions\n"
                                  ";date.timezone =\n"
                                  "date.timezone = \"Europe/Berlin\"\n"
                                  "\n"
                                  "[mail function]\n"
                                  "SMTP = localhost\n"
                                  "smtp_port = 25\n"
                                  ";sendmail_path =\n"
                                  "mail.add_x_header = Off\n"
                                  "\n"
                                  "[Session]\n"
                                  "session.save_handler = files\n"
                                  "session.gc_probability = 1\n"
                                  "session.gc_divisor = 1000\n"
                                  "session.cookie_httponly =\n");
    EXPECT_EQ(reader.ParseError(), 0);
    EXPECT_TRUE(reader.GetBoolean(L"PHP", L"engine", false));
    EXPECT_FALSE(reader.GetBoolean(L"PHP", L"short_open_tag", true));
    EXPECT_EQ(reader.GetInteger(L"PHP", L"precision", 0), 14);
    EXPECT_EQ(reader.GetInteger(L"PHP", L"memory_limit", 0), 128);
    EXPECT_EQ(reader.Get(L"PHP", L"memory_limit", L""), L"128M");
    EXPECT_EQ(reader.Get(L"PHP", L"error_reporting", L""), L"E_ALL & ~E_DEPRECATED & ~E_STRICT");
    EXPECT_EQ(reader.Get(L"PHP", L"extension", L"none"), L"none");
    EXPECT_EQ(reader.Get(L"PHP", L"url_rewriter.tags", L""), L"\"a=href,area=href,frame=src,form=\"");
    EXPECT_EQ(reader.Get(L"Date", L"date.timezone", L""), L"\"Europe/Berlin\"");
    EXPECT_EQ(reader.GetInteger(L"mail function", L"smtp_port", 0), 25);
    EXPECT_EQ(reader.GetReal(L"Session", L"session.gc_divisor", 0), 1000.0);
    EXPECT_TRUE(reader.GetBoolean(L"Session", L"session.cookie_httponly", true));
    EXPECT_FALSE(reader.GetBoolean(L"Session", L"session.cookie_httponly", false));
}
