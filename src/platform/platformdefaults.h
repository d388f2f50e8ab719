#pragma once

#include <QString>

namespace tagora {

// The stored defaults name Windows places ("c:\program files\tagora",
// "c:\mylabel.lbl"). Elsewhere they become the user's data folder and home
// folder, so a first start points at places that exist and can be written.
QString platformDefault(const QString& text);

// Data folder joined with a file name, as every database path is built.
QString joinDataPath(const QString& folder, const QString& fileName);

} // namespace tagora
