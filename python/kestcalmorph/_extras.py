"""Pictures and data frames: presentation over the views, for the optional packages."""

import numpy as np


def _require(module, package):
    try:
        return __import__(module, fromlist=["_"])
    except ImportError as error:
        raise ImportError(f"this needs {module}; install it (Debian: apt-get install {package})"
                          ) from error


def _label(text, units):
    return f"{text} [{units}]" if units else text


def plot(item, ax=None, kind="auto"):
    """Draws the item on `ax` (a new figure when None): a curve as a line, a map as a heatmap,
    or as a surface with kind="surface". Returns the axes drawn on."""
    plt = _require("matplotlib.pyplot", "python3-matplotlib")
    values = item.values
    if not isinstance(values, np.ndarray):
        raise TypeError(f"item {item.name} holds no numbers to plot")
    axes = list(item.axes)

    def points(i):
        p = axes[i].points if i < len(axes) else None
        return np.arange(values.shape[i]) if p is None else p

    def axis_label(i):
        return _label(f"axis {i}", axes[i].units) if i < len(axes) else "index"

    if kind not in ("auto", "line", "heatmap", "surface"):
        raise ValueError(f"kind must be auto, line, heatmap or surface, not {kind!r}")
    if values.ndim == 2 and kind == "surface":
        if ax is None:
            ax = plt.figure().add_subplot(projection="3d")
        x, y = np.meshgrid(points(1), points(0))
        ax.plot_surface(x, y, values, cmap="viridis")
        ax.set_xlabel(axis_label(1))
        ax.set_ylabel(axis_label(0))
        ax.set_zlabel(_label(item.name, item.units))
        return ax
    if ax is None:
        ax = plt.figure().add_subplot()
    if values.ndim <= 1 and kind in ("auto", "line"):
        flat = np.atleast_1d(values)
        ax.plot(points(0) if values.ndim == 1 else [0], flat, marker="o")
        ax.set_xlabel(axis_label(0))
        ax.set_ylabel(_label(item.name, item.units))
    elif values.ndim == 2 and kind in ("auto", "heatmap"):
        image = ax.pcolormesh(points(1), points(0), values, shading="nearest")
        ax.figure.colorbar(image, ax=ax, label=_label(item.name, item.units))
        ax.set_xlabel(axis_label(1))
        ax.set_ylabel(axis_label(0))
    else:
        raise ValueError(f"cannot draw {values.ndim}-D values as {kind}")
    ax.set_title(item.name)
    return ax


def to_dataframe(data):
    """One row per value element: list, item, format, units, index, x, y, value."""
    pd = _require("pandas", "python3-pandas")
    rows = []
    for cal_list in data.lists:
        for item in cal_list.items:
            values = item.values
            axes = [a.points for a in item.axes]
            if isinstance(values, np.ndarray) and values.ndim > 0:
                positions = list(np.ndindex(values.shape))
                flat = values.ravel().tolist()
            else:
                positions = [()] * (1 if isinstance(values, np.ndarray) else len(values))
                flat = [values.item()] if isinstance(values, np.ndarray) else list(values)
            for k, (pos, value) in enumerate(zip(positions, flat)):
                xy = [axes[d][pos[d]] if d < len(pos) and d < len(axes) and axes[d] is not None
                      and len(pos) == len(axes) else None for d in range(2)]
                rows.append((cal_list.name, item.name, item.format, item.units, k, xy[0], xy[1],
                             value))
    return pd.DataFrame(rows, columns=["list", "item", "format", "units", "index", "x", "y",
                                       "value"])
