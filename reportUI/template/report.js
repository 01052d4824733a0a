// Fills the sections of the page from the data blocks that stand in its head.
//
// Names of files come from anybody who may write into a share. They are shown, never interpreted:
// everything goes in as text, and what can't be seen or turns the reading direction is spelled out.
(function () {
  'use strict';

  // One entry per report. To add one: name its variable and columns here (column name and kind),
  // and its heading and new column names in every dictionary.
  var REPORTS = {
    share_list: {
      variable: 'vornShareListData',
      columns: [['share', 'text'], ['volume', 'text'], ['size', 'size']]
    },
    large_file: {
      variable: 'vornLargeFileData',
      columns: [['share', 'text'], ['file', 'text'], ['size', 'size']],
      limit: 200
    }
  };

  // A cell writer per kind of column.
  var KINDS = {text: writeText, size: writeSize};

  var UNITS = ['B', 'KiB', 'MiB', 'GiB', 'TiB', 'PiB', 'EiB'];

  var dictionary = window.vornText;

  function say(key, number) {
    return dictionary[key].replace('{n}', number);
  }

  function append(parent, tag, text) {
    var element = document.createElement(tag);
    if (text !== undefined) {
      element.textContent = text;
    }
    return parent.appendChild(element);
  }

  // A byte that is no UTF-8 arrives as a lone low surrogate that carries it.
  function nameOf(character) {
    var code = character.codePointAt(0);
    if (code >= 0xdc80 && code <= 0xdcff) {
      return '\\x' + (code - 0xdc00).toString(16);
    }
    return 'U+' + code.toString(16).toUpperCase().padStart(4, '0');
  }

  function writeText(cell, value) {
    var text = append(cell, 'bdi');
    // Controls, formats (bidirectional and zero-width ones), line separators, lone surrogates.
    value.split(/([\p{Cc}\p{Cf}\p{Zl}\p{Zp}\p{Cs}])/u).forEach(function (piece, index) {
      if (index % 2 === 1) {
        append(text, 'span', nameOf(piece)).className = 'chip';
      } else {
        text.append(piece);
      }
    });
  }

  function writeSize(cell, value) {
    cell.className = 'number';
    if (!/^[0-9]+$/.test(value)) {
      cell.textContent = value;
      return;
    }
    var size = Number(value);
    var unit = 0;
    while (size >= 1023.95 && unit < UNITS.length - 1) {
      size /= 1024;
      ++unit;
    }
    cell.textContent =
        size.toLocaleString(dictionary.lang, {maximumFractionDigits: 1}) + '\u00a0' + UNITS[unit];
    cell.title = say('bytes', BigInt(value).toLocaleString(dictionary.lang));
  }

  // The rows of `report`; null when its block is there but damaged; undefined without a block.
  //
  // A block that was left open swallows the ones after it, up to the next end tag. Those are whole,
  // so they are run again on their own.
  function rowsOf(report) {
    var start = 'var ' + report.variable + ' = [\n';
    var blocks = Array.from(document.scripts, function (script) {
      var text = script.textContent;
      return text.indexOf(start) < 0 ? '' : text.slice(text.indexOf(start)).split('<script')[0];
    }).filter(Boolean);
    if (blocks.length > 0 && window[report.variable] === undefined) {
      append(document.head, 'script', blocks[0]);
    }
    var rows = window[report.variable];
    if (rows === undefined) {
      return blocks.length > 0 ? null : undefined;
    }
    var whole = Array.isArray(rows) && rows.every(function (row) {
      return Array.isArray(row) && row.length === report.columns.length &&
          row.every(function (value) { return typeof value === 'string'; });
    });
    return whole ? rows : null;
  }

  function note(section, text) {
    var paragraph = append(section, 'p', text);
    paragraph.className = 'note';
    return paragraph;
  }

  function fillTable(section, report, rows) {
    var table = section.querySelector('table');
    var head = append(append(table, 'thead'), 'tr');
    report.columns.forEach(function (column) {
      var cell = append(head, 'th', dictionary.columns[column[0]] || column[0]);
      cell.scope = 'col';
      cell.className = column[1] === 'text' ? '' : 'number';
    });
    var body = append(table, 'tbody');
    rows.forEach(function (row) {
      var line = append(body, 'tr');
      report.columns.forEach(function (column, index) {
        KINDS[column[1]](append(line, 'td'), row[index]);
      });
    });
    if (rows.length === report.limit) {
      note(section, say('firstRows', rows.length));
    }
  }

  // Reports without a block are empty or have failed. An empty one leaves an end tag behind, and
  // the head tells their number.
  function explainMissing(sections) {
    var meta = document.querySelector('meta[name="vorn-empty-reports"]');
    var empty = meta ? Number(meta.content) : 0;
    var key = empty >= sections.length ? 'noRows' : empty === 0 ? 'missing' : 'unclear';
    sections.forEach(function (section) { note(section, say(key)); });
  }

  function fillSection(section) {
    var name = section.dataset.report;
    var report = REPORTS[name];
    var heading = section.querySelector('h2');
    heading.textContent = dictionary.reports[name] || heading.textContent;
    if (!report) {
      note(section, say('unknown'));
      return false;
    }
    var rows = rowsOf(report);
    if (rows === null) {
      note(section, say('damaged'));
    } else if (rows) {
      fillTable(section, report, rows);
    }
    return rows === undefined;
  }

  document.querySelectorAll('[data-text]').forEach(function (element) {
    element.textContent = say(element.dataset.text);
  });
  document.title = say('title') + ' – ' + document.getElementById('host').textContent;
  explainMissing(Array.from(document.querySelectorAll('section[data-report]')).filter(fillSection));
}());
