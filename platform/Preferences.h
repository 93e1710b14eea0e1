#pragma once

#include <QSettings>
#include <QString>

#include <memory>
#include <optional>

class QFileInfo;

namespace qivo {

/// The user's preferences: one text file of the application's own, per user.
///
/// A file that cannot be trusted never stops the application: it is read as if empty, or as far as it makes sense, and
/// a line in the log says why. Nothing of it gets lost: before the first write a damaged file is copied beside itself
/// (with ".damaged" and, if need be, a number added to its name), and a file that cannot be read is not written at all.
///
/// Thread: one, the main thread.
class Preferences {
  public:
    /// A larger file is no preferences file of ours, and is not read.
    static constexpr qint64 kMaximumFileSize = 1 << 20;

    /// The file of the user who runs the application.
    static QString userFile();

    /// Opens a file; it need not exist.
    explicit Preferences(const QString& file = userFile());

    /// The value, or nothing if the key is absent or holds something else.
    std::optional<bool> boolForKey(const QString& key);
    std::optional<QString> stringForKey(const QString& key);

    /// Stores a value in the file at once. A failure is logged, the first time.
    void setBool(bool value, const QString& key);
    void setString(const QString& value, const QString& key);

  private:
    enum class Damage { none, keepCopy, leaveAlone };

    void inspect(const QFileInfo& info);
    void refuse(const QString& reason);
    void reportWrongType(const QString& key, const char* expected);
    void write(const QString& key, const QVariant& value);
    bool keepCopy();
    void reportWriteFailure(const QString& reason);

    QString m_file;
    std::unique_ptr<QSettings> m_settings; // null while the file is not to be read
    Damage m_damage = Damage::none;
    bool m_writeFailureReported = false;
};

} // namespace qivo
