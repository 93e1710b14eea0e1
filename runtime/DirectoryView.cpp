#include "runtime/DirectoryView.h"

#include "runtime/Directory.h"

#include <utility>

namespace qivo::runtime {
namespace {

class DirectoryView final : public SourceView {
  public:
    explicit DirectoryView(std::shared_ptr<Directory> directory) : m_directory(std::move(directory)) {}

    std::optional<Announcement> findByName(std::string_view name) const override {
        return m_directory->findByName(name);
    }

    std::optional<Announcement> findByUrl(std::string_view url) const override { return m_directory->findByUrl(url); }

    std::shared_ptr<void> subscribe(std::function<void()> changed) override {
        return std::make_shared<Directory::Subscription>(m_directory->subscribe(std::move(changed)));
    }

  private:
    const std::shared_ptr<Directory> m_directory;
};

} // namespace

std::shared_ptr<SourceView> directoryView() {
    auto directory = Directory::acquire();
    return directory ? std::make_shared<DirectoryView>(std::move(directory)) : nullptr;
}

} // namespace qivo::runtime
