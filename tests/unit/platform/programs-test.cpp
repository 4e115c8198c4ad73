#include <gmock/gmock.h>

#include "tests/unit/platform/support.h"

class programs_test : public stand_in_test {
protected:
    void SetUp() override
    {
        if (!has_sandbox()) {
            GTEST_SKIP() << "bubblewrap cannot make a sandbox here";
        }
    }
};

#define START "/tmp/bin/amt-audio 44100 1 1024 /system/media/ring.wav"
#define ALIVE(pid)                                                                                           \
    "if kill -0 " pid " 2>/dev/null && ! grep -q '^State:.*Z' /proc/" pid                                    \
    "/status; then echo alive; else echo gone; fi; "

TEST_F(programs_test, sync_records_and_returns_its_script)
{
    write("answers/sync", "0\n1\n");
    const result_st result =
        run_in_handset("/tmp/bin/sync; echo $?; /tmp/bin/sync; echo $?; /tmp/bin/sync; echo $?");
    EXPECT_EQ(result.m_output, "0\n1\n1\n");
    EXPECT_THAT(calls(), testing::ElementsAre("sync() = 0", "sync() = 1", "sync() = 1"));
}

TEST_F(programs_test, player_goes_into_the_background_with_its_id_on_record)
{
    const result_st result = run_in_handset(START "; echo $?; pid=$(cat /tmp/amt-audio.pid); "
                                                  "tr '\\0' ' ' < /proc/$pid/cmdline; echo; " ALIVE(
                                                      "$pid") "kill -9 $pid; sleep 0.2; " ALIVE("$pid"));
    EXPECT_EQ(result.m_output, "0\n/tmp/bin/amt-audio 44100 1 1024 /system/media/ring.wav \nalive\ngone\n");
    EXPECT_THAT(calls(), testing::ElementsAre("amt-audio(44100, 1, 1024, /system/media/ring.wav) = 0"));
}

TEST_F(programs_test, player_keeps_nothing_of_its_starter)
{
    /* The reader of the pipe sees its end although the player plays on. */
    const result_st result =
        run_in_handset("exec 7> /tmp/kept; " START " | cat; pid=$(cat /tmp/amt-audio.pid); sleep 0.2; " ALIVE(
            "$pid") "ls -l /proc/$pid/fd | sed -n 's/.* -> //p' | sort -u");
    EXPECT_EQ(result.m_output, "alive\n/dev/null\n");
}

TEST_F(programs_test, player_stays_when_only_its_pid_file_is_gone)
{
    const result_st result = run_in_handset(
        START "; pid=$(cat /tmp/amt-audio.pid); rm /tmp/amt-audio.pid; sleep 0.4; " ALIVE("$pid"));
    EXPECT_EQ(result.m_output, "alive\n");
}

TEST_F(programs_test, a_later_player_takes_over)
{
    const result_st result = run_in_handset(
        START "; first=$(cat /tmp/amt-audio.pid); " START
              "; second=$(cat /tmp/amt-audio.pid); sleep 0.5; " ALIVE("$first") ALIVE("$second"));
    EXPECT_EQ(result.m_output, "gone\nalive\n");
}

TEST_F(programs_test, player_ends_after_its_scripted_seconds)
{
    write("answers/amt-audio", "0 1\n");
    const result_st result = run_in_handset(START "; pid=$(cat /tmp/amt-audio.pid); sleep 0.4; " ALIVE(
        "$pid") "sleep 1.2; " ALIVE("$pid") "ls /tmp/amt-audio.pid 2>/dev/null");
    EXPECT_EQ(result.m_output, "alive\ngone\n");
}

TEST_F(programs_test, player_fails_as_scripted_before_it_starts)
{
    write("answers/amt-audio", "3\n");
    const result_st result = run_in_handset(START "; echo $?; ls /tmp/amt-audio.pid 2>/dev/null");
    EXPECT_EQ(result.m_output, "3\n");
    EXPECT_THAT(calls(), testing::ElementsAre("amt-audio(44100, 1, 1024, /system/media/ring.wav) = 3"));
}

TEST_F(programs_test, player_wants_four_arguments)
{
    const result_st result = run_in_handset("/tmp/bin/amt-audio 44100; echo $?");
    EXPECT_THAT(result.m_output, testing::HasSubstr("usage: amt-audio"));
    EXPECT_THAT(result.m_output, testing::EndsWith("\n2\n"));
    EXPECT_THAT(calls(), testing::IsEmpty());
}
