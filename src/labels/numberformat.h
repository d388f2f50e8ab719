#pragma once

#include <QString>
#include <QVariant>

namespace tagora {

// A number written by a user's format pattern, the way label designers know
// them: "0.00", "#,##0.00", "0%", "₪ 0.00", sections for negative and zero
// values ("0.00;(0.00);-"), and the names "Fixed", "Standard", "Percent",
// "General Number". Halves round away from zero on the number as written in
// decimal. A null value gives empty text; text that is not a number is
// returned as it is.
QString FormatNumber(const QVariant& value, const QString& pattern);

} // namespace tagora
