// SPDX-License-Identifier: Apache-2.0
#include "platform/picture_changes.h"
#include "platform/x11/x11_failure.h"
#include "tests/x11/storages_bench.h"

// A film in a window: the rows that were painted time and again are read to where they belong, with the
// question for what has been painted.

namespace {

using namespace platform;
using namespace platform::x11;

constexpr std::uint32_t GREEN = 0xFF00FF00;
constexpr std::uint32_t BLUE = 0xFF0000FF;
constexpr std::uint32_t RED = 0xFFFF0000;
constexpr PixelRect PLACE{40, 30, 240, 130};
constexpr int WIDTH = 200;
constexpr int HEIGHT = 100;
constexpr PixelRect FILM{20, 30, 180, 70};
constexpr PixelRect ROWS{0, 30, WIDTH, 70};
constexpr int FILM_AREA = 160 * 40;

class Film {
public:
    Film() {
        bench.Begin();
        window = bench.Show(PLACE);
        EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
        for (const std::uint32_t colour : {0xFF0000U, 0x0000FFU, 0xFF0000U, 0x0000FFU}) {
            Paint(colour);
            serial = TakenSerial();
        }
    }

    void Paint(std::uint32_t colour, const PixelRect& rect = FILM) {
        bench.Fill(window, colour, rect);
        bench.Settle();
    }
    /// How many bytes it has asked for, which are here.
    std::size_t AskAhead() {
        const std::optional<std::size_t> bytes = bench.Storages().AskAhead();
        bench.Connection().RoundTrip();
        return bytes.value_or(0);
    }
    unsigned Requests() { return xcb_no_operation(bench.Connection().Get()).sequence; }
    PicturePtr Take() { return bench.TakeOne(window); }

    StoragesBench bench;
    xcb_window_t window = 0;
    std::uint64_t serial = 0; // of the last picture

private:
    std::uint64_t TakenSerial() {
        const PicturePtr picture = Take();
        EXPECT_NE(picture, nullptr);
        return picture != nullptr ? picture->serial : 0;
    }
};

constexpr std::size_t ROW_BYTES = std::size_t{WIDTH} * 4 * 40;

TEST(WindowStorages, FetchTheRowsOfAFilmWithTheQuestionForDamage) {
    Film film;
    film.Paint(0xFF0000);
    EXPECT_EQ(film.AskAhead(), ROW_BYTES);
    const auto before = film.bench.Storages().TrafficSoFar();
    const unsigned requests = film.Requests();
    const PicturePtr picture = film.Take();
    EXPECT_EQ(film.Requests(), requests + 1) << "it asked again";
    EXPECT_EQ(film.bench.Storages().TrafficSoFar().bytes - before.bytes, ROW_BYTES);
    EXPECT_EQ(CountOf(*picture, RED), FILM_AREA);
    EXPECT_EQ(CountOf(*picture, GREEN), WIDTH * HEIGHT - FILM_AREA);
    EXPECT_GT(picture->serial, film.serial);
    EXPECT_EQ(ChangesSince(*picture, film.serial), PixelRegion(FILM));
}

TEST(WindowStorages, ReadNoRowsAheadBeforeTheyWerePaintedThriceAgain) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show({0, 0, 1000, 600});
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    // Too much to be read for nothing, and then the same again and again.
    for (const int time : {1, 2, 3, 4, 5, 6}) {
        bench.Fill(window, static_cast<std::uint32_t>(time), {0, 100, 900, 500});
        bench.Settle();
        const std::optional<std::size_t> bytes = bench.Storages().AskAhead();
        ASSERT_TRUE(bytes);
        EXPECT_EQ(*bytes, time <= 4 ? 0U : 1000U * 4 * 400) << time;
        EXPECT_EQ(CountOf(*bench.TakeOne(window), 0xFF000000U + static_cast<std::uint32_t>(time)), 900 * 400);
    }
    // Elsewhere it begins anew.
    bench.Fill(window, 0xFF0000, {0, 100, 900, 501});
    bench.Settle();
    EXPECT_GT(bench.Storages().AskAhead(), 0U);
    EXPECT_EQ(CountOf(*bench.TakeOne(window), RED), 900 * 401);
    bench.Fill(window, 0x0000FF, {0, 100, 900, 501});
    bench.Settle();
    EXPECT_EQ(bench.Storages().AskAhead(), 0U);
    EXPECT_EQ(CountOf(*bench.TakeOne(window), BLUE), 900 * 401);
}

TEST(WindowStorages, TellOfTheRowsOfAFilmWhatWasPaintedOfThem) {
    Film film;
    film.Paint(0xFF0000, {40, 40, 50, 50});
    EXPECT_EQ(film.AskAhead(), ROW_BYTES);
    const PicturePtr picture = film.Take();
    EXPECT_EQ(CountOf(*picture, RED), 100);
    EXPECT_EQ(CountOf(*picture, BLUE), FILM_AREA - 100);
    EXPECT_EQ(ChangesSince(*picture, film.serial), PixelRegion(PixelRect{40, 40, 50, 50}));
}

TEST(WindowStorages, FetchWhatIsPaintedBesideTheRowsOfAFilm) {
    Film film;
    film.bench.Fill(film.window, 0xFF0000, FILM);
    film.Paint(0xFF0000, {0, 0, 10, 10});
    EXPECT_EQ(film.AskAhead(), ROW_BYTES);
    const PicturePtr picture = film.Take();
    EXPECT_EQ(CountOf(*picture, RED), FILM_AREA + 100);
    EXPECT_EQ(CountOf(*picture, GREEN), WIDTH * HEIGHT - FILM_AREA - 100);
    // The server may have written anything that is newer to those rows.
    PixelRegion changed(ROWS);
    changed.Add(PixelRect{0, 0, 10, 10});
    EXPECT_EQ(ChangesSince(*picture, film.serial), changed);
}

TEST(WindowStorages, FetchAgainWhatIsPaintedAfterTheRowsOfAFilmWereAskedFor) {
    Film film;
    film.Paint(0x00FFFF);
    EXPECT_EQ(film.AskAhead(), ROW_BYTES);
    film.Paint(0xFF0000);
    EXPECT_EQ(CountOf(*film.Take(), RED), FILM_AREA);
    // Twice before anybody takes a picture.
    film.Paint(0x00FFFF);
    film.AskAhead();
    film.Paint(0x0000FF);
    film.AskAhead();
    EXPECT_EQ(CountOf(*film.Take(), BLUE), FILM_AREA);
}

TEST(WindowStorages, WriteNoRowsOfAFilmToAPictureThatSomebodyHolds) {
    Film film;
    const PicturePtr held = film.Take();
    ASSERT_EQ(CountOf(*held, BLUE), FILM_AREA);
    film.Paint(0xFF0000);
    EXPECT_EQ(film.AskAhead(), 0U);
    const PicturePtr picture = film.Take();
    EXPECT_EQ(CountOf(*picture, RED), FILM_AREA);
    EXPECT_EQ(CountOf(*held, BLUE), FILM_AREA);
    EXPECT_EQ(ChangesSince(*picture, held->serial), PixelRegion(FILM));
}

TEST(WindowStorages, ShowAWindowAsItIsThatWasResizedDuringItsFilm) {
    Film film;
    film.Paint(0xFF0000);
    EXPECT_EQ(film.AskAhead(), ROW_BYTES);
    film.bench.Resize(film.window, 60, 50);
    film.bench.Settle();
    EXPECT_TRUE(film.bench.ComesTrueMeanwhile([&] {
        film.Paint(0xFF0000, {0, 0, 60, 50});
        film.bench.Storages().AskAhead();
        return IsAll(film.Take(), RED);
    }));
}

TEST(WindowStorages, GoOnWithAFilmAfterTheServerHasNotAnsweredInTime) {
    Film film;
    film.Paint(0xFF0000);
    film.bench.Server().Stop();
    EXPECT_EQ(film.bench.Storages().AskAhead(), ROW_BYTES);
    film.bench.Connection().SetDeadline(CmSteadyNow() + std::chrono::milliseconds(20));
    WindowPictureRequest request;
    request.windows = {film.window};
    request.rect = {{0, 0}, {300, 300}};
    EXPECT_THROW(film.bench.Storages().Take(request, film.bench.Tree(), {}, [&] { film.bench.CatchUp(); }),
                 Unanswered);
    film.bench.Server().Continue();
    film.bench.Connection().SetDeadline(CmSteadyNow() + PATIENCE);
    EXPECT_EQ(CountOf(*film.Take(), RED), FILM_AREA);
}

TEST(WindowStorages, ShowNoFilmOfAWindowThatIsGone) {
    Film film;
    film.Paint(0xFF0000);
    EXPECT_EQ(film.AskAhead(), ROW_BYTES);
    xcb_destroy_window(film.bench.Client(), film.window);
    film.bench.Settle();
    EXPECT_EQ(film.Take(), nullptr);
}

} // namespace
