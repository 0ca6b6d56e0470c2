// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

// What the client tells a running or stopped engine.

namespace {

using Texts = std::vector<std::string>;

constexpr unsigned NO_PROCESS = 0x80000000u;

/// A source that only knows its type and id.
class CFakeSource final : public IShareSource, public qvn::CQvnUnknownImpl {
public:
    CFakeSource(CCallLog& calls, ShareSourceType type, unsigned long id)
        : m_calls(calls),
          m_type(type),
          m_id(id) {}

    unsigned AddRef() override { return AddRefImpl(); }
    unsigned Release() override { return ReleaseImpl(); }
    int QueryInterface(const qvn::_tagUUID& iid, void** out) override { return QueryInterfaceImpl(iid, out); }
    unsigned GetReference() override { return GetReferenceImpl(); }
    unsigned long GetSourceUniqueId() override { return m_id; }
    ShareSourceType GetSourceType() override { return m_type; }
    bool IsShared() override { return false; }
    TVLRect GetSourceRect(bool) override { return {}; }
    void SetSourceRect(const TVLRect&) override {}
    int GetDeviceName(char*, int) override { return -1; }
    int GetDeviceId(char*, int) override { return -1; }
    void* GetSourceHandle() override { return nullptr; }
    void SetInfo(const ShareSourceInfo*) override {}

protected:
    ~CFakeSource() override { m_calls.Add("source deleted"); }

private:
    CCallLog& m_calls;
    ShareSourceType m_type;
    unsigned long m_id;
};

/// A capturer that takes every control operation, logs it and answers `result`.
class CControlCapturer final : public CShareCapturerBase {
public:
    explicit CControlCapturer(CCallLog& calls) : m_calls(calls) {}

    int result = 0;
    bool usable = true;

    int Capture(IShareFrame*) override { return SHARE_CAPTURE_NO_DATA; }
    int AddCaptureShareSource(IShareSource*) override { return Log("AddCaptureShareSource"); }
    int RemoveCaptureShareSource(IShareSource*) override { return Log("RemoveCaptureShareSource"); }
    int GetCaptureShareSourceCount() override { return 3; }
    IShareSource* GetCaptureShareSource(int) override { return nullptr; }
    int GetCurrentCaptureSourceSize(TVLSize&) override { return Log("GetCurrentCaptureSourceSize"); }
    int SetFilterSelf(bool filter) override { return Log(filter ? "SetFilterSelf 1" : "SetFilterSelf 0"); }
    int AddSharedWindow(unsigned id) override { return Log("AddSharedWindow", id); }
    int RemoveSharedWindow(unsigned id) override { return Log("RemoveSharedWindow", id); }
    int AddUnSharedWindow(unsigned id) override { return Log("AddUnSharedWindow", id); }
    int RemoveUnSharedWindow(unsigned id) override { return Log("RemoveUnSharedWindow", id); }
    int AddSharedProcess(unsigned id) override { return Log("AddSharedProcess", id); }
    int RemoveSharedProcess(unsigned id) override { return Log("RemoveSharedProcess", id); }
    int AddUnSharedProcess(unsigned id) override { return Log("AddUnSharedProcess", id); }
    int RemoveUnSharedProcess(unsigned id) override { return Log("RemoveUnSharedProcess", id); }
    int SetCaptureThreadCount(unsigned count) override { return Log("SetCaptureThreadCount", count); }
    bool Reinit() override { return usable; }

private:
    int Log(const std::string& call) {
        m_calls.Add(call);
        return result;
    }
    int Log(const std::string& call, unsigned value) { return Log(call + " " + std::to_string(value)); }

    CCallLog& m_calls;
};

class ControlOperations : public testing::Test {
protected:
    ControlOperations() {
        EXPECT_EQ(bench.engine->SetExternalIShareCapturer(&control), 0);
        bench.Forget();
    }
    ~ControlOperations() override {
        EXPECT_EQ(bench.engine->Stop(), 0);
        EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0); // it ends before the engine does
    }

    CEngineBench<> bench;
    CControlCapturer control{bench.calls};
};

struct Operation {
    const char* name;
    std::function<int(IShareCaptureEngine&, unsigned)> call;
    unsigned refused;
};

const std::vector<Operation>& ListOperations() {
    static const std::vector<Operation> operations = {
        {"AddSharedWindow", [](auto& engine, unsigned id) { return engine.AddSharedWindow(id); }, 0},
        {"RemoveSharedWindow", [](auto& engine, unsigned id) { return engine.RemoveSharedWindow(id); }, 0},
        {"AddUnSharedWindow", [](auto& engine, unsigned id) { return engine.AddUnSharedWindow(id); }, 0},
        {"RemoveUnSharedWindow", [](auto& engine, unsigned id) { return engine.RemoveUnSharedWindow(id); },
         0},
        {"AddUnSharedProcess", [](auto& engine, unsigned id) { return engine.AddUnSharedProcess(id); },
         NO_PROCESS},
        {"RemoveUnSharedProcess", [](auto& engine, unsigned id) { return engine.RemoveUnSharedProcess(id); },
         NO_PROCESS},
        {"SetCaptureThreadCount", [](auto& engine, unsigned id) { return engine.SetCaptureThreadCount(id); },
         0},
    };
    return operations;
}

} // namespace

TEST_F(ControlOperations, HandTheCapturersResultOnBeforeStart) {
    for (const Operation& operation : ListOperations()) {
        SCOPED_TRACE(operation.name);
        for (const int result : {0, -1, -3}) {
            bench.Forget();
            control.result = result;
            EXPECT_EQ(operation.call(*bench.engine, 7), result);
            EXPECT_EQ(bench.calls.Calls(), Texts{std::string(operation.name) + " 7"});
        }
    }
}

TEST_F(ControlOperations, GiveZeroAfterStartAndRunOnTheWorker) {
    control.result = -1;
    ASSERT_EQ(bench.engine->Start(), 0);
    for (const Operation& operation : ListOperations()) {
        SCOPED_TRACE(operation.name);
        bench.Forget();
        EXPECT_EQ(operation.call(*bench.engine, 7), 0);
        Settle(*bench.engine->_GetWorker());
        EXPECT_EQ(bench.calls.Calls(), Texts{std::string(operation.name) + " 7"});
    }
}

TEST_F(ControlOperations, RefuseTheValueThatNamesNothing) {
    for (const Operation& operation : ListOperations()) {
        SCOPED_TRACE(operation.name);
        EXPECT_EQ(operation.call(*bench.engine, operation.refused), -2);
    }
    EXPECT_TRUE(bench.calls.Calls().empty());
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST_F(ControlOperations, NeedACapturer) {
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    bench.Forget();
    for (const Operation& operation : ListOperations()) {
        SCOPED_TRACE(operation.name);
        EXPECT_EQ(operation.call(*bench.engine, 7), -4);
    }
    EXPECT_EQ(bench.engine->SetFilterSelf(true), -4);
    EXPECT_TRUE(bench.trace.Lines().empty());
    EXPECT_EQ(bench.engine->GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(bench.engine->GetCaptureShareSource(0), nullptr);
}

TEST_F(ControlOperations, TraceTheProcessesThatAreKeptOut) {
    bench.engine->AddUnSharedProcess(77);
    bench.engine->RemoveUnSharedProcess(78);
    EXPECT_EQ(bench.trace.Lines(), (Texts{Info("[CShareCaptureEngine::AddUnSharedProcess]>> pid=77"),
                                          Info("[CShareCaptureEngine::RemoveUnSharedProcess]>> pid=78")}));
}

TEST_F(ControlOperations, FilterTheOwnProcessThroughTheCapturer) {
    EXPECT_EQ(bench.engine->SetFilterSelf(true), 0);
    EXPECT_EQ(bench.engine->SetFilterSelf(false), 0);
    EXPECT_EQ(bench.calls.Calls(), (Texts{"SetFilterSelf 1", "SetFilterSelf 0"}));
}

TEST_F(ControlOperations, ThatBelongToOtherKindsAreNotAvailable) {
    EXPECT_EQ(bench.engine->AddSharedProcess(7), -3);
    EXPECT_EQ(bench.engine->RemoveSharedProcess(7), -3);
    EXPECT_EQ(bench.engine->SelectSharedDisplay(7), -3);
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST_F(ControlOperations, AskTheCapturerForItsSourcesDirectly) {
    EXPECT_EQ(bench.engine->GetCaptureShareSourceCount(), 3);
}

TEST(AddSharedWindow, UpdatesTheSizeOfAWindowEngineWhateverTheResult) {
    CEngineBench<CShareCaptureWindowEngine> bench;
    CControlCapturer control(bench.calls);
    bench.engine->GiveOwnCapturer(Borrow(control));
    for (const int result : {0, -1}) {
        bench.Forget();
        control.result = result;
        EXPECT_EQ(bench.engine->AddSharedWindow(7), result);
        EXPECT_EQ(bench.calls.Calls(), (Texts{"AddSharedWindow 7", "GetCurrentCaptureSourceSize"}));
        bench.Forget();
        EXPECT_EQ(bench.engine->RemoveSharedWindow(7), result);
        EXPECT_EQ(bench.calls.Calls(), Texts{"RemoveSharedWindow 7"});
    }
    bench.engine->GiveOwnCapturer(nullptr);
}

// Sources.

class Sources : public ControlOperations {
protected:
    Sources() { source->AddRef(); }
    ~Sources() override {
        if (source != nullptr)
            source->Release();
    }

    CFakeSource* source = new CFakeSource(bench.calls, SHARE_SOURCE_TYPE_MONITOR, 42);
};

TEST_F(Sources, AreRefusedWhenNull) {
    EXPECT_EQ(bench.engine->AddCaptureShareSource(nullptr), -2);
    EXPECT_EQ(bench.engine->RemoveCaptureShareSource(nullptr), -2);
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST_F(Sources, NeedACapturer) {
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    bench.Forget();
    EXPECT_EQ(bench.engine->AddCaptureShareSource(source), -4);
    EXPECT_EQ(bench.engine->RemoveCaptureShareSource(source), -4);
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST_F(Sources, ThatAreTakenUpdateTheSize) {
    EXPECT_EQ(bench.engine->AddCaptureShareSource(source), 0);
    EXPECT_EQ(bench.calls.Calls(), (Texts{"AddCaptureShareSource", "GetCurrentCaptureSourceSize"}));
    const Texts lines = bench.trace.LinesContaining("AddCaptureShareSource");
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_NE(lines[0].find("[CShareCaptureEngine::AddCaptureShareSource]>>,pIShareSource=0x"),
              std::string::npos);
    EXPECT_NE(lines[0].find(",sourceId=42,eShareSourceType=2"), std::string::npos);
    EXPECT_NE(lines[1].find("INFO: [CShareCaptureEngine::AddCaptureShareSource]>>success,pIShareSource=0x"),
              std::string::npos);
    EXPECT_NE(lines[1].find(",eShareSourceType=2"), std::string::npos);
}

TEST_F(Sources, ThatAreRefusedByTheCapturerAreTracedAndUpdateNothing) {
    control.result = -1;
    EXPECT_EQ(bench.engine->AddCaptureShareSource(source), -1);
    EXPECT_EQ(bench.calls.Calls(), Texts{"AddCaptureShareSource"});
    EXPECT_TRUE(
        bench.trace.Contains("ERROR: [CShareCaptureEngine::AddCaptureShareSource]>>fail,pIShareSource=0x"));
}

TEST_F(Sources, ThatAreRemovedUpdateNothing) {
    EXPECT_EQ(bench.engine->RemoveCaptureShareSource(source), 0);
    EXPECT_EQ(bench.calls.Calls(), Texts{"RemoveCaptureShareSource"});
    EXPECT_EQ(bench.trace.Lines(),
              Texts{Info("[CShareCaptureEngine::RemoveCaptureShareSource]>>eShareSourceType=2")});
}

TEST_F(Sources, MayBeLetGoByTheClientAsSoonAsTheCallHasReturned) {
    ASSERT_EQ(bench.engine->Start(), 0);
    CGate goOn;
    bench.engine->RunOnCaptureThread([&] {
        EXPECT_TRUE(goOn.Passes());
        return 0u;
    });
    EXPECT_EQ(bench.engine->AddCaptureShareSource(source), 0);
    source->Release();
    source = nullptr;
    EXPECT_EQ(bench.calls.Count("source deleted"), 0u);
    goOn.Open();
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(bench.calls.Count("AddCaptureShareSource"), 1u);
    EXPECT_EQ(bench.calls.Count("source deleted"), 1u);
}

// Capture mode and colour.

class CaptureMode : public testing::Test {
protected:
    ~CaptureMode() override {
        AppShareConfig::Instance()->m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_DEFAULT;
    }
};

TEST_F(CaptureMode, ThatIsInForceAlreadyIsTracedAndKept) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT), 0);
    EXPECT_EQ(WithoutSourcePlaces(bench.trace.Lines()),
              Texts{Warning("[CShareCaptureEngine::SetCaptureMode] set same capture mode=1")});
}

TEST_F(CaptureMode, ThatIsNotOfferedIsRefused) {
    CEngineBench<> bench;
    for (const int mode : {6, 0, 2, 9, 11, -1}) {
        bench.Forget();
        EXPECT_EQ(bench.engine->SetCaptureMode(static_cast<SCREEN_CAPTURER_TYPE>(mode)), -5);
        EXPECT_EQ(WithoutSourcePlaces(bench.trace.Lines()),
                  Texts{Error("[CShareCaptureEngine::SetCaptureMode]>>fail with unsupport capture mode "
                              "eSCREEN_CAPTURER_TYPE=" +
                              std::to_string(mode))});
        EXPECT_EQ(AppShareConfig::Instance()->GetScreenCapturerType(), 1);
    }
}

TEST_F(CaptureMode, ChangesThoughAnEngineWithoutAnOwnCapturerHasNothingToRebuild) {
    CEngineBench<> bench;
    AppShareConfig::Instance()->m_bWin8EnableMag = true;
    AppShareConfig::Instance()->m_bRecreateCapturer = true;
    EXPECT_EQ(bench.engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_AVFOUNDATION), 0);
    EXPECT_EQ(bench.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_AVFOUNDATION);
    EXPECT_EQ(AppShareConfig::Instance()->GetScreenCapturerType(), 7);
    EXPECT_FALSE(AppShareConfig::Instance()->m_bRecreateCapturer);
    EXPECT_TRUE(AppShareConfig::Instance()->m_bWin8EnableMag);
    EXPECT_EQ(WithoutSourcePlaces(bench.trace.Lines()),
              (Texts{Info("[CShareCaptureEngine::SetCaptureMode]>> old=1,new=7"),
                     Error("[CShareCaptureEngine::SetCaptureMode] failed >> recreate share capturer")}));
    EXPECT_EQ(bench.engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT), 0);
    EXPECT_FALSE(AppShareConfig::Instance()->m_bWin8EnableMag);
}

TEST_F(CaptureMode, TakesTheOwnCapturerDownBeforeItAsksForANewOne) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.engine->GiveOwnCapturer(std::make_shared<CFakeCapturer>(bench.calls));
    bench.Forget();
    EXPECT_EQ(bench.engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_CGS_GCD), 0);
    EXPECT_EQ(bench.calls.Calls(), (Texts{"capturer RemoveSink", "capturer deleted"}));
    EXPECT_TRUE(bench.trace.Contains(Info("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=1")));
}

TEST_F(CaptureMode, OfTheProcessIsTheDefaultAgainWithEachNewEngine) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_CGS_GCD), 0);
    const CShareCaptureEngine second;
    EXPECT_EQ(AppShareConfig::Instance()->GetScreenCapturerType(), 1);
    EXPECT_EQ(bench.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_CGS_GCD);
}

TEST(BackgroundColor, IsStoredForTheProcessAndTraced) {
    CEngineBench<> bench;
    EXPECT_EQ(AppShareConfig::Instance()->m_nAppShareBackgroundColor, 0x9e9e);
    EXPECT_EQ(bench.engine->SetAppShareBackgroundColor(0x123456), 0);
    EXPECT_EQ(AppShareConfig::Instance()->m_nAppShareBackgroundColor, 0x123456);
    EXPECT_EQ(bench.trace.Lines(),
              Texts{Info("[CShareCaptureEngine::SetAppShareBackgroundColor]>>rgbValue=1193046")});
}

TEST(Shared, NothingAndNobodyIsNeverShared) {
    CEngineBench<> bench;
    EXPECT_FALSE(bench.engine->IsAppShared(NO_PROCESS));
    EXPECT_FALSE(bench.engine->IsWindowShared(0));
}
