#include "platform/Preferences.h"

#include "platform/Log.h"

#include <QFile>
#include <QFileInfo>
#include <QStandardPaths>

#include <algorithm>

namespace qivo {
namespace {

constexpr int kMaximumCopies = 100;

QString nameOfCopy(const QString& file, int number) {
    const QString name = file + QStringLiteral(".damaged");
    return number == 0 ? name : name + QLatin1Char('.') + QString::number(number);
}

/// Whether every line is one that a preferences file has. The toolkit passes over what it cannot read, and would leave
/// it out when it writes the file again.
bool isWellFormed(const QByteArray& content) {
    if (content.contains('\0') || !content.isValidUtf8()) {
        return false;
    }
    const QList<QByteArray> lines = content.split('\n');
    return std::all_of(lines.begin(), lines.end(), [](const QByteArray& line) {
        const QByteArray text = line.trimmed();
        return text.isEmpty() || text.startsWith(';') || text.startsWith('#') ||
               (text.startsWith('[') && text.endsWith(']')) || text.indexOf('=') > 0;
    });
}

} // namespace

QString Preferences::userFile() {
    return QStandardPaths::writableLocation(QStandardPaths::GenericConfigLocation) +
           QStringLiteral("/Orvane/QIVO Viewer.conf");
}

Preferences::Preferences(const QString& file) : m_file(file) {
    const QFileInfo info(file);
    if (info.exists()) {
        inspect(info);
    }
    if (m_damage != Damage::leaveAlone) {
        m_settings = std::make_unique<QSettings>(file, QSettings::NativeFormat);
    }
}

/// Before anything opens the file for good: another kind of file could block, and a damaged one must be known as such.
void Preferences::inspect(const QFileInfo& info) {
    QFile content(m_file);
    if (!info.isFile()) {
        refuse(QStringLiteral("it is not a regular file"));
    } else if (info.size() > kMaximumFileSize) {
        refuse(QStringLiteral("it is larger than %1 bytes").arg(kMaximumFileSize));
    } else if (!content.open(QIODevice::ReadOnly)) {
        refuse(QStringLiteral("it cannot be read"));
    } else if (!isWellFormed(content.readAll())) {
        m_damage = Damage::keepCopy;
        logLine("The preferences file %s is damaged; what can be read of it is used", qUtf8Printable(m_file));
    }
}

void Preferences::refuse(const QString& reason) {
    m_damage = Damage::leaveAlone;
    logLine("The preferences file %s is not used, since %s; settings are at their defaults and will not be saved",
            qUtf8Printable(m_file), qUtf8Printable(reason));
}

std::optional<bool> Preferences::boolForKey(const QString& key) {
    if (!m_settings || !m_settings->contains(key)) {
        return std::nullopt;
    }
    const QString text = m_settings->value(key).toString().toLower();
    if (text == QLatin1String("true") || text == QLatin1String("1")) {
        return true;
    }
    if (text == QLatin1String("false") || text == QLatin1String("0")) {
        return false;
    }
    reportWrongType(key, "true or false");
    return std::nullopt;
}

std::optional<QString> Preferences::stringForKey(const QString& key) {
    if (!m_settings || !m_settings->contains(key)) {
        return std::nullopt;
    }
    const QVariant value = m_settings->value(key);
    if (value.metaType().id() != QMetaType::QString) {
        reportWrongType(key, "a text");
        return std::nullopt;
    }
    return value.toString();
}

void Preferences::reportWrongType(const QString& key, const char* expected) {
    m_damage = Damage::keepCopy;
    logLine("The preference %s in %s is not %s; its default is used", qUtf8Printable(key), qUtf8Printable(m_file),
            expected);
}

void Preferences::setBool(bool value, const QString& key) {
    write(key, value);
}

void Preferences::setString(const QString& value, const QString& key) {
    write(key, value);
}

void Preferences::write(const QString& key, const QVariant& value) {
    if (m_damage == Damage::leaveAlone) {
        return;
    }
    if (m_damage == Damage::keepCopy && !keepCopy()) {
        m_damage = Damage::leaveAlone;
        reportWriteFailure(QStringLiteral("no copy of the damaged file could be kept"));
        return;
    }
    m_damage = Damage::none;
    m_settings->setValue(key, value);
    m_settings->sync();
    // A format error would be remembered from reading; only a refused access means that the write failed.
    if (m_settings->status() == QSettings::AccessError) {
        reportWriteFailure(QStringLiteral("the file cannot be written"));
    }
}

bool Preferences::keepCopy() {
    for (int number = 0; number < kMaximumCopies; ++number) {
        const QString copy = nameOfCopy(m_file, number);
        if (!QFileInfo::exists(copy)) {
            return QFile::copy(m_file, copy);
        }
    }
    return false;
}

void Preferences::reportWriteFailure(const QString& reason) {
    if (!m_writeFailureReported) {
        m_writeFailureReported = true;
        logLine("The settings could not be saved in %s: %s", qUtf8Printable(m_file), qUtf8Printable(reason));
    }
}

} // namespace qivo
