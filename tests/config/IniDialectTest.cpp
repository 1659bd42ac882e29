// INI files the way other programs write them, with what INIReader makes of each.
#include "IniTestFile.h"

#include <gtest/gtest.h>

#include <string>

using KelvraTest::ExpectIniValues;

TEST(IniDialect, WindowsWinIniAndSystemIni)
{
    ExpectIniValues("; for 16-bit app support\r\n"
                    "[mci extensions]\r\n"
                    "[Mail]\r\n"
                    "MAPI=1\r\n"
                    "MAPIXVER=1.0.0.1\r\n"
                    "[MCI Extensions.BAK]\r\n"
                    "3g2=MPEGVideo\r\n"
                    "m4v=MPEGVideo\r\n"
                    "[Desktop]\r\n"
                    "Wallpaper=C:\\Windows\\Web\\Wallpaper\\Windows\\img0.jpg\r\n"
                    "TileWallpaper=0\r\n",
                    {{L"mail", L"mapi", L"1"},
                     {L"Mail", L"MAPIXVER", L"1.0.0.1"},
                     {L"MCI Extensions.BAK", L"3g2", L"MPEGVideo"},
                     {L"mci extensions", L"bak.m4v", L"MPEGVideo"}, // the dot joins keys
                     {L"Desktop", L"Wallpaper", L"C:\\Windows\\Web\\Wallpaper\\Windows\\img0.jpg"}});
    ExpectIniValues("; for 16-bit app support\r\n"
                    "[386Enh]\r\n"
                    "woafont=dosapp.fon\r\n"
                    "CGA40WOA.FON=CGA40WOA.FON\r\n"
                    "\r\n"
                    "[mci]\r\n"
                    "[boot]\r\n"
                    "shell=Explorer.exe\r\n"
                    "SCRNSAVE.EXE=\r\n",
                    {{L"386enh", L"woafont", L"dosapp.fon"},
                     {L"386Enh", L"cga40woa.fon", L"CGA40WOA.FON"},
                     {L"boot", L"SCRNSAVE.EXE", nullptr}});
}

TEST(IniDialect, DesktopEntryInUtf8)
{
    // The UTF-8 bytes of a Russian name, each read as a character of its own.
    const std::wstring russian = L"\u00d0\u0092\u00d0\u00b5\u00d0\u00b1-\u00d0\u00b1\u00d1\u0080\u00d0\u00b0"
                                 L"\u00d1\u0083\u00d0\u00b7\u00d0\u00b5\u00d1\u0080";
    ExpectIniValues("[Desktop Entry]\n"
                    "Name=Firefox Web Browser\n"
                    "Name[fr]=Navigateur Web Firefox\n"
                    "GenericName[ru]=\xD0\x92\xD0\xB5\xD0\xB1-\xD0\xB1\xD1\x80\xD0\xB0"
                    "\xD1\x83\xD0\xB7\xD0\xB5\xD1\x80\n"
                    "Exec=firefox %u\n"
                    "Categories=GNOME;GTK;Network;WebBrowser;\n"
                    "\n"
                    "# A comment the way desktop files write them\n"
                    "[Desktop Action new-private-window]\n"
                    "Name=Open a New Private Window\n"
                    "Exec=firefox -private-window\n",
                    {{L"Desktop Entry", L"Name", L"Firefox Web Browser"},
                     {L"Desktop Entry", L"name[FR]", L"Navigateur Web Firefox"},
                     {L"Desktop Entry", L"GenericName[ru]", russian.c_str()},
                     {L"Desktop Entry", L"Exec", L"firefox %u"},
                     {L"Desktop Entry", L"Categories", L"GNOME;GTK;Network;WebBrowser;"},
                     {L"Desktop Action new-private-window", L"Exec", L"firefox -private-window"}});
}

TEST(IniDialect, GitConfigKeepsTheFirstIndentedKeyOfEachSection)
{
    // git indents its keys with a tab: after the first key of a section every indented line
    // continues that key's value, which already holds one, so only the first keys are stored.
    ExpectIniValues("[core]\n"
                    "\trepositoryformatversion = 0\n"
                    "\tfilemode = true\n"
                    "[remote \"origin\"]\n"
                    "\turl = https://example.com/team/project.git\n"
                    "\tfetch = +refs/heads/*:refs/remotes/origin/*\n"
                    "[user]\n"
                    "name = Ada Lovelace\n"
                    "email = ada@example.com\n",
                    {{L"core", L"repositoryformatversion", L"0"},
                     {L"core", L"filemode", nullptr},
                     {L"remote \"origin\"", L"url", L"https://example.com/team/project.git"},
                     {L"remote \"origin\"", L"fetch", nullptr},
                     {L"user", L"name", L"Ada Lovelace"}});
}

TEST(IniDialect, PhpConfigurationWithLongCommentBlocks)
{
    // Its last comment line is longer than one read of 199 characters.
    const std::string comments = ";;;;;;;;;;;;;;;;;;;\n"
                                 "; About php.ini   ;\n"
                                 ";;;;;;;;;;;;;;;;;;;\n"
                                 "; PHP's initialization file, generally called php.ini, is responsible for\n"
                                 "; configuring many of the aspects of PHP's behavior.\n"
                                 ";\n"
                                 "; See https://www.php.net/manual/en/ini.list.php for " +
                                 std::string(220, '.') + "\n";
    ExpectIniValues("[PHP]\n" + comments +
                        "\n"
                        "; Enable the PHP scripting language engine under Apache.\n"
                        "engine = On\n"
                        "error_reporting = E_ALL & ~E_DEPRECATED & ~E_STRICT\n"
                        ";extension=curl\n"
                        "url_rewriter.tags = \"a=href,area=href,frame=src,form=\"\n"
                        "\n"
                        "[Date]\n"
                        ";date.timezone =\n"
                        "date.timezone = \"Europe/Berlin\"\n"
                        "\n"
                        "[Session]\n"
                        "session.cookie_httponly =\n",
                    {{L"PHP", L"engine", L"On"},
                     {L"PHP", L"error_reporting", L"E_ALL & ~E_DEPRECATED & ~E_STRICT"},
                     {L"PHP", L"extension", nullptr},
                     {L"PHP", L"url_rewriter.tags", L"\"a=href,area=href,frame=src,form=\""},
                     {L"Date", L"date.timezone", L"\"Europe/Berlin\""},
                     {L"Session", L"session.cookie_httponly", nullptr}});
}
