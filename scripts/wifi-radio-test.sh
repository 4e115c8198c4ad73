#!/system/bin/sh
# Wi-Fi transmission and reception tests with the chip's own tool. The daemon carries this text as constant data; it
# neither writes nor runs it.
#
# Words are left unquoted on purpose: a missing argument leaves the word out, as the tool wants it.
# shellcheck disable=SC2086
# Every step is "command && its OK line || end"; echo does not fail.
# shellcheck disable=SC2015

# channel, rate, power
startWifiTxFunc()
{
    echo "enter startWifiTxFunc"
    mChannel=$1
    mRate=$2
    mPower=$3

    version=$($WL_PATH ver)
    echo "$version"

    $WL_PATH down && echo "down OK" || exit 1
    $WL_PATH mpc 0 && echo "mpc 0 OK" || exit 1
    $WL_PATH up && echo "up OK" || exit 1
    $WL_PATH country ALL && echo "country ALL OK" || exit 1
    $WL_PATH PM 0 && echo "PM 0 OK" || exit 1
    $WL_PATH down && echo "down OK" || exit 1
    $WL_PATH channel $mChannel && echo "channel $mChannel OK" || exit 1
    $WL_PATH rate $mRate && echo "rate $mRate OK" || exit 1
    $WL_PATH rateset $mRate'b' && echo "rateset $mRate OK" || exit 1
    $WL_PATH up && echo "up OK" || exit 1
    $WL_PATH txpwr1 -o -d $mPower && echo "txpwr1 $mPower OK" || exit 1
    power=$($WL_PATH txpwr1) && echo "the power is:$power" || exit 1
    $WL_PATH pkteng_start 00:11:22:33:44:55: tx 1000 1024 0 && echo "pkteng_start tx OK" || exit 1
    return 0
}

stopWifiTxFunc()
{
    echo "enter stopWifiTxFunc"
    $WL_PATH pkteng_stop tx && echo "tx stop OK" || exit 1
}

# channel, rate
startWifiRxFunc()
{
    echo "enter startWifiRxFunc"
    mChannel=$1
    mRate=$2

    # Not associated is as good as disassociated: its failure ends nothing.
    $WL_PATH disassoc && echo "disassoc OK"
    $WL_PATH mpc 0 && echo "mpc 0 OK" || exit 1
    $WL_PATH up && echo "up OK" || exit 1
    $WL_PATH down && echo "down OK" || exit 1
    $WL_PATH channel $mChannel && echo "channel $mChannel OK" || exit 1
    # The beacon interval.
    $WL_PATH bi 50000 && echo "bi 50000 OK" || exit 1
    $WL_PATH rate $mRate && echo "rate $mRate OK" || exit 1
    # The "||" is missing, so that this step never ends the script; it has to stay so.
    $WL_PATH rateset $mRate'b' && echo Set rateset to $mRate success exit 1
    $WL_PATH up && echo "up OK" || exit 1
}

stopWifiRxFunc()
{
    echo "enter stopWifiRxFunc"
}

WL_PATH=/system/bin/wl
echo $WL_PATH
version=0
power=0
# Nothing measures the packet error rate here; the name is reserved for it.
# shellcheck disable=SC2034
PER=0
cmdType=$1
echo "cmdType is $cmdType"

# Rates are given in hundredths of Mbit/s for this one value only.
rate=$3
if [ "$rate" = 550 ]; then
    rate=5.5
fi

case "$cmdType" in
11)
    startWifiTxFunc $2 $rate $4
    ;;
12)
    startWifiRxFunc $2 $rate
    ;;
13)
    stopWifiTxFunc
    ;;
14)
    stopWifiRxFunc
    ;;
*)
    echo "invalid command option"
    # Only the brackets are quoted.
    # shellcheck disable=SC2026
    echo wifi test: 11'('start Tx')', 12'('start Rx')', 13'('stop Tx')', 14'('stop Rx')'
    exit 1
    ;;
esac
exit 0
