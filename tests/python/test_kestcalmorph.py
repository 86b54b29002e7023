import datetime
import gc
import os
import threading

import numpy as np
import pytest

import kestcalmorph as k

ROOT = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
SAMPLE = os.path.join(ROOT, "examples", "sample.cdf")
EDGE = os.path.join(ROOT, "tests", "data", "ops", "edge.cdf")
SCHEMA_DATA = os.path.join(ROOT, "tests", "data", "schema")


def item(data, name):
    return next(i for l in data.lists for i in l.items if i.name == name)


@pytest.mark.parametrize("path", [SAMPLE, EDGE])
def test_write_then_read_gives_the_same_tree(path, tmp_path):
    data = k.read(path)
    assert k.from_json(data.to_json()).to_json() == data.to_json()
    if path == SAMPLE:  # edge.cdf holds elements a write turns into others by the writing rules
        data.write(tmp_path / "out.cdf", indent=True)
        assert k.read(tmp_path / "out.cdf").to_json() == data.to_json()


def test_map_is_laid_out_along_its_axes_and_edits_reach_the_file(tmp_path):
    data = k.read(SAMPLE)
    torque = data.lists["EngineControl"].items["TorqueLimit"]
    speed, load = (a.points for a in torque.axes)
    assert torque.values.shape == (len(speed), len(load))
    new = torque.values.copy()
    new[1, 2] = 123.5
    torque.values = new
    data.write(tmp_path / "out.cdf")
    again = item(k.read(tmp_path / "out.cdf"), "TorqueLimit").values
    assert again[1, 2] == 123.5 and again.sum() == pytest.approx(new.sum())


@pytest.mark.parametrize("assigned, dtype", [
    (np.array([1, 2, 3, 4, 5], dtype=np.int64), np.int32),
    (np.array([1, 2, 3, 4, 5], dtype=np.uint8), np.int32),
    (np.array([1.5, 2, 3, 4, 5]), np.float64),
    (7, np.int32),
])
def test_assigned_numbers_keep_their_kind(assigned, dtype):
    data = k.read(SAMPLE)
    item(data, "IdleSpeedTarget").values = assigned
    values = item(k.from_json(data.to_json()), "IdleSpeedTarget").values
    assert values.dtype == dtype and values.shape == (5,)
    assert np.array_equal(values, np.broadcast_to(assigned, (5,)))


@pytest.mark.parametrize("name, attribute, value, error", [
    ("TorqueLimit", "values", np.zeros((3, 4)), ValueError),
    ("TorqueLimit", "values", np.array(["a"] * 12).reshape(4, 3), TypeError),
    ("IdleSpeedTarget", "values", np.array([2 ** 31, 0, 0, 0, 0]), ValueError),
    ("KnockRetardMax", "values", np.zeros((2, 2)), ValueError),
    ("FaultLampMode", "values", ["OFF", None, "ON"], TypeError),
    ("FaultLampMode", "values", "OFF", TypeError),
    ("TorqueLimit", "name", None, TypeError),
    ("TorqueLimit", "units", 5, TypeError),
    ("TorqueLimit", "note", "\ud800", UnicodeEncodeError),
])
def test_bad_assignments_raise_and_leave_the_tree_unchanged(name, attribute, value, error):
    data = k.read(SAMPLE)
    before = data.to_json()
    with pytest.raises(error):
        setattr(item(data, name), attribute, value)
    assert data.to_json() == before


def test_nan_is_refused_for_an_integer_item():
    data = k.from_json(k.read(SAMPLE).to_json())
    target = item(data, "IdleSpeedTarget")
    target.values = np.arange(5)
    with pytest.raises(ValueError, match="NaN"):
        target.values = np.array([1.0, np.nan, 3, 4, 5])
    assert target.values.dtype == np.int32


def test_paths_that_are_no_cdf_file_raise_clearly(tmp_path):
    with pytest.raises(IsADirectoryError):
        k.read(tmp_path)
    with pytest.raises(ValueError, match="UTF-8"):
        k.read(os.fsdecode(b"/tmp/\xff.cdf"))
    with pytest.raises(k.LoadError) as missing:
        k.read(tmp_path / "none.cdf")
    assert missing.value.file.endswith("none.cdf")
    (tmp_path / "bad.cdf").write_text("<CAL-DATA>\n  <FILENAME>x</CAL-DATA>\n")
    with pytest.raises(k.LoadError) as broken:
        k.read(tmp_path / "bad.cdf")
    assert broken.value.line == 2 and broken.value.column > 0


def test_validate_reports_position_and_read_raises_validation_error():
    bad = os.path.join(SCHEMA_DATA, "wrong-order.cdf")
    assert k.validate(SAMPLE) == []
    problems = k.validate(bad)
    assert len(problems) == 1 and problems[0].line == 6
    with pytest.raises(k.ValidationError) as error:
        k.read(bad)
    assert (error.value.line, error.value.column) == (problems[0].line, problems[0].column)
    assert k.read(bad, validate=False).lists


def test_numbers_not_taken_whole_are_warnings(tmp_path):
    text = open(SAMPLE, encoding="utf-8").read().replace(">1200 980", ">12x0 980", 1)
    (tmp_path / "w.cdf").write_text(text, encoding="utf-8")
    with pytest.warns(k.TokenWarning) as caught:
        data = k.read(tmp_path / "w.cdf")
    assert [(w.item, w.token, w.kind) for w in data.warnings] == [
        ("IdleSpeedTarget", "12x0", "partial")]
    assert caught[0].message.line == 31


def test_new_lists_items_and_changes_are_written(tmp_path):
    data = k.CalData()
    data.file_name = "new.cdf"
    data.history.new("me", datetime.datetime(2025, 1, 2, 3, 4, 5), note="first")
    lst = data.lists.new("L", symbolic_file=("a.a2l", 0xDEADBEEF))
    lst.items.new("Map", np.arange(6).reshape(2, 3), units="Nm", axes=[[1, 2], [10, 20, 30]])
    lst.items.new("Texts", ["a", "b"])
    with pytest.raises(ValueError):
        data.history.new("me", datetime.datetime(1800, 1, 1))
    data.write(tmp_path / "new.cdf")
    again = k.read(tmp_path / "new.cdf")
    assert again.history[0].date == datetime.datetime(2025, 1, 2, 3, 4, 5)
    assert again.lists["L"].symbolic_file == ("a.a2l", 0xDEADBEEF)
    assert np.array_equal(item(again, "Map").values, np.arange(6).reshape(2, 3))
    assert item(again, "Texts").values == ["a", "b"] and len(data.history) == 1


def test_views_outlive_their_caldata_and_threads_do_not_crash(tmp_path):
    view = k.read(SAMPLE).lists[0].items["TorqueLimit"]
    gc.collect()
    assert view.values.shape == view.shape
    data = k.read(SAMPLE)

    def work(n):
        for i in range(20):
            item(data, "KnockRetardMax").values = float(i)
            data.write(tmp_path / f"t{n}.cdf")

    threads = [threading.Thread(target=work, args=(n,)) for n in range(2)]
    for t in threads:
        t.start()
    for t in threads:
        t.join()
    assert item(k.read(tmp_path / "t0.cdf"), "KnockRetardMax").values.shape == ()


def test_bad_json_names_its_path():
    with pytest.raises(k.JsonError) as error:
        k.from_json(k.read(SAMPLE).to_json().replace('"TorqueLimit"', "17"))
    assert "items[1]" in error.value.path


def test_dataframe_has_a_row_per_element_and_plots_draw():
    pd = pytest.importorskip("pandas")
    data = k.read(SAMPLE)
    frame = data.to_dataframe()
    assert isinstance(frame, pd.DataFrame)
    count = sum(np.size(i.values) if isinstance(i.values, np.ndarray) else len(i.values)
                for l in data.lists for i in l.items)
    assert len(frame) == count
    row = frame[(frame["item"] == "TorqueLimit") & (frame["index"] == 4)].iloc[0]
    torque = item(data, "TorqueLimit")
    assert (row["x"], row["y"], row["value"]) == (torque.axes[0].points[1],
                                                  torque.axes[1].points[1], torque.values[1, 1])
    pytest.importorskip("matplotlib").use("Agg")
    assert torque.plot().collections and item(data, "IdleSpeedTarget").plot().lines
    assert torque.plot(kind="surface").name == "3d"


def test_diff_merge_and_check_work_on_views():
    base, ours, theirs = (k.read(SAMPLE) for _ in range(3))
    assert k.diff(base, ours)["equal"]
    torque = item(ours, "TorqueLimit")
    changed = torque.values.astype(float)
    changed[1, 2] += 0.5
    torque.values = changed
    (element,) = k.diff(base, ours)["changed"][0]["elements"]
    assert (element["index"], element["difference"]) == (5, 0.5)
    assert k.diff(base, ours, tolerance=0.5)["equal"]
    item(theirs, "KnockRetardMax").values = 9.0
    merged = k.merge(base, ours, theirs)
    assert merged["conflicts"] == []
    assert item(merged["merged"], "TorqueLimit").values[1, 2] == changed[1, 2]
    assert item(merged["merged"], "KnockRetardMax").values == 9.0
    item(theirs, "TorqueLimit").values = changed + 1
    assert k.merge(base, ours, theirs)["conflicts"][0]["item"] == "TorqueLimit"
    with pytest.raises(ValueError):
        k.merge(base, ours, theirs, prefer="mine")
    kinds = {f["kind"] for f in k.check(base, verify_crc=True)}
    assert kinds == {"crc-missing"}
