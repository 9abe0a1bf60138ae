#include "vrx/host/home/home_changes.h"

#include <filesystem>
#include <utility>

#include "vrx/host/base/files.h"
#include "vrx/host/home/shown_follow_up.h"

namespace vrx::host {

namespace {

// Joins the writes of one transaction, and those of one refresh.
constexpr platform::Duration writesPause = std::chrono::milliseconds(50);

using Hash = std::size_t;

Hash hashOf(std::string_view text) {
    return std::hash<std::string_view>()(text);
}

}  // namespace

class HomeChanges::Comparison {
public:
    Comparison(Places places, std::function<void(Changes::Kinds)> tell)
        : places_(std::move(places)), tell_(std::move(tell)) {}

    void take() {
        followUps_ = followUps();
        records_ = records();
    }
    void compare() {
        auto followUps = this->followUps();
        auto records = this->records();
        Changes::Kinds kinds = 0;
        // What cannot be read has not changed.
        if (followUps && std::exchange(followUps_, followUps) != followUps) kinds |= Changes::followUps;
        if (std::exchange(records_, records) != records) kinds |= Changes::coverage;
        if (kinds) tell_(kinds);
    }

private:
    // Waits for the writer's lock: a writer changes the files first, and then commits in shared memory.
    std::optional<Hash> followUps() const {
        std::string text = std::to_string(dayInterval(places_.defaults).count());
        places_.database.write([](Connection&) {});
        const platform::MaybeError error = places_.database.read([&](Connection& connection) {
            Statement& rows =
                connection.statement("SELECT identifier, item FROM follow_ups WHERE client = ? ORDER BY position")
                    .bind(0, places_.client);
            while (rows.step()) {
                const auto item = rows.bytes(1);
                text.append(rows.text(0)).append(1, '\0').append(item.begin(), item.end());
            }
        });
        return error ? std::nullopt : std::optional(hashOf(text));
    }

    std::map<std::string, Hash> records() const {
        std::map<std::string, Hash> hashes;
        std::error_code error;
        for (std::filesystem::directory_iterator entry(places_.recordsFolder, error), end; !error && entry != end;
             entry.increment(error))
            if (const auto content = readFile(entry->path())) hashes[entry->path()] = hashOf(content->text());
        return hashes;
    }

    const Places places_;
    const std::function<void(Changes::Kinds)> tell_;
    std::optional<Hash> followUps_;
    std::map<std::string, Hash> records_;
};

HomeChanges::HomeChanges(sd_event* loop, std::shared_ptr<platform::Queue> queue, Places places,
                         std::function<void(Changes::Kinds)> tell)
    : comparison_(std::make_shared<Comparison>(places, std::move(tell))),
      watch_(
          loop, {places.databasePath + "-wal", places.recordsFolder}, writesPause,
          [queue, comparison = comparison_] { queue->post([comparison] { comparison->compare(); }); },
          FolderChanges::Notice::Writing) {
    queue->post([comparison = comparison_] { comparison->take(); });
}

}  // namespace vrx::host
