// Fills the sections of the page from the data blocks that stand in its head.
//
// Names of files come from anybody who may write into a share. They are shown, never interpreted:
// everything goes in as text, and what can't be seen or turns the reading direction is spelled out.
(function () {
  'use strict';

  // One entry per report. To add one: name its variable and columns here (column name and kind),
  // and its heading and new column names in every dictionary.
  //   limit     rows (with `limitOf`: numbers in that column) that the page gets at most, and the
  //             key of the note for a table that long
  //   sections  the data is an object of tables, not one table
  //   mode      a variable whose value chooses the heading
  //   neverEmpty  without a block the report has failed: it has no way to have no rows
  var REPORTS = {
    quota_usage: {
      variable: 'vornQuotaUsageTable',
      columns: [['user', 'text'], ['quota', 'quota'], ['used', 'size'], ['percent', 'percent']],
      limit: [100, 'smallestUsers'],
      sections: true,
      neverEmpty: true
    },
    file_owner: {
      variable: 'vornFileOwnerData',
      columns: [['owner', 'text'], ['share', 'text'], ['files', 'count'], ['size', 'size']]
    },
    volume_usage: {
      variable: 'vornVolumeUsageData',
      columns: [
        ['volume', 'text'], ['used', 'size'], ['free', 'size'], ['percent', 'percent'],
        ['days', 'days']
      ],
      neverEmpty: true
    },
    share_list: {
      variable: 'vornShareListData',
      columns: [['share', 'text'], ['volume', 'text'], ['size', 'size']]
    },
    file_group: {
      variable: 'vornFileGroupTableData',
      columns: [['type', 'type'], ['share', 'text'], ['size', 'size']],
      limit: [100, 'cutRows'],
      sections: true
    },
    duplicate_file: {
      variable: 'vornDuplicateFileData',
      columns: [
        ['group', 'count'], ['share', 'text'], ['file', 'text'], ['size', 'size'],
        ['changed', 'time']
      ],
      limit: [200, 'firstGroups'],
      limitOf: 0,
      mode: 'vornDuplicateHashMatch'
    },
    large_file: {
      variable: 'vornLargeFileData',
      columns: [['share', 'text'], ['file', 'text'], ['size', 'size']],
      limit: [200, 'firstRows']
    },
    least_modify: {
      variable: 'vornLeastModifyData',
      columns: [['share', 'text'], ['file', 'text'], ['size', 'size'], ['changed', 'time']],
      limit: [200, 'firstRows']
    },
    most_modify: {
      variable: 'vornMostModifyData',
      columns: [['share', 'text'], ['file', 'text'], ['size', 'size'], ['changed', 'time']],
      limit: [200, 'firstRows']
    }
  };

  // A cell writer per kind of column; each gets a text.
  var KINDS = {
    text: writeText, type: writeType, size: writeSize, quota: writeQuota, count: writeCount,
    percent: writePercent, days: writeDays, time: writeTime
  };

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

  function writeType(cell, value) {
    writeText(cell, dictionary.types[value.replace('reportUI_file_type_', '')] || value);
  }

  function writeSize(cell, value) {
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

  function writeQuota(cell, value) {
    if (value === '0') {
      cell.textContent = say('noLimit');
    } else {
      writeSize(cell, value);
    }
  }

  function writeCount(cell, value) {
    cell.textContent = /^[0-9]+$/.test(value) ?
        BigInt(value).toLocaleString(dictionary.lang) : value;
  }

  function writePercent(cell, value) {
    var number = parseFloat(value);
    // Negative: there is no quota to take it of. No number: of a volume of size 0.
    cell.textContent = number >= 0 ?
        number.toLocaleString(dictionary.lang, {maximumFractionDigits: 1}) + '\u00a0%' : '–';
  }

  // Without history there is no estimate, whatever the number says.
  function writeDays(cell, value) {
    cell.textContent = value === '-' || !window.vornVolumeUsageDataHistory ? '–' : value;
  }

  function writeTime(cell, value) {
    var time = new Date(Number(value) * 1000);
    cell.textContent = isNaN(time) ? value :
        time.toLocaleString(dictionary.lang, {dateStyle: 'medium', timeStyle: 'short'});
  }

  // The texts of the script elements from `start` on.
  //
  // A block that was left open swallows the ones after it, up to the next end tag.
  function blocksFrom(start) {
    return Array.from(document.scripts, function (script) {
      var text = script.textContent;
      return text.indexOf(start) < 0 ? '' : text.slice(text.indexOf(start)).split('<script')[0];
    }).filter(Boolean);
  }

  function isRow(report, row) {
    return Array.isArray(row) && row.length === report.columns.length &&
        row.every(function (value) { return /string|number/.test(typeof value); });
  }

  // The tables of `report`, each a name and rows; null when its block is there but damaged;
  // undefined without a block.
  function tablesOf(report) {
    if (report.sections) {
      return sectionsOf(report);
    }
    // Swallowed blocks are whole, so they are run again on their own.
    var blocks = blocksFrom('var ' + report.variable + ' = [\n');
    if (blocks.length > 0 && window[report.variable] === undefined) {
      append(document.head, 'script', blocks[0]);
    }
    var rows = window[report.variable];
    if (rows === undefined) {
      return blocks.length > 0 ? null : undefined;
    }
    var whole = Array.isArray(rows) && rows.every(isRow.bind(null, report));
    return whole ? [{rows: rows}] : null;
  }

  // Read from the text, never run: an account's name is a key without quotes there, and what is no
  // JavaScript name (john-doe), or no plain one (007, __proto__), breaks the block or its order.
  // So does a section beyond the limit, which has its closing bracket and no opening.
  function sectionsOf(report) {
    var blocks = blocksFrom('var ' + report.variable + ' = {\n');
    if (blocks.length === 0) {
      return undefined;
    }
    if (!/\}\s*$/.test(blocks[0])) {
      return null;
    }
    var sections = [];
    var whole = blocks[0].split('\n').slice(1).every(function (line) {
      var opening = /^'?(.+?)'? : \[$/.exec(line);
      if (opening) {
        return sections.push({name: opening[1], rows: []});
      }
      if (line[0] !== '[') {
        return true;
      }
      var values = /^\[(.*?)\][\]}, ]*$/.exec(line);
      var row = values && (values[1].match(/'[^']*'|[^\s',]+/g) || []).map(function (value) {
        return value.replace(/'/g, '');
      });
      return sections.length > 0 && isRow(report, row) &&
          sections[sections.length - 1].rows.push(row);
    });
    return whole ? sections : null;
  }

  function note(section, text) {
    var paragraph = append(section, 'p', text);
    paragraph.className = 'note';
    return paragraph;
  }

  function fillTable(table, report, content) {
    if (content.name) {
      append(table, 'caption',
             content.name === 'vornAll' ? say('allFiles') : content.name);
    }
    var head = append(append(table, 'thead'), 'tr');
    function isNumber(column) {
      return column[1] !== 'text' && column[1] !== 'type';
    }
    report.columns.forEach(function (column) {
      var cell = append(head, 'th', dictionary.columns[column[0]] || column[0]);
      cell.scope = 'col';
      cell.className = isNumber(column) ? 'number' : '';
    });
    var body = append(table, 'tbody');
    content.rows.forEach(function (row) {
      var line = append(body, 'tr');
      report.columns.forEach(function (column, index) {
        var cell = append(line, 'td');
        cell.className = isNumber(column) ? 'number' : '';
        KINDS[column[1]](cell, String(row[index]));
      });
    });
  }

  // Whether `count` rows, or the last number in a column of `rows`, are as many as the page gets.
  function isCut(report, rows, count) {
    return Boolean(report.limit) && report.limit[0] ===
        (report.limitOf === undefined ? count : Number(rows[rows.length - 1][report.limitOf]));
  }

  function fillTables(section, report, tables) {
    var count = 0;
    tables.forEach(function (content, index) {
      var table = section.querySelector('table');
      fillTable(index === 0 ? table : section.insertBefore(table.cloneNode(), null), report,
                content);
      // Sections share one limit, except those of volumes.
      count = report.neverEmpty ? content.rows.length : count + content.rows.length;
      if (isCut(report, content.rows, count)) {
        note(section, say(report.limit[1], report.limit[0]));
      }
    });
    if (report === REPORTS.volume_usage) {
      note(section, say(window.vornVolumeUsageDataHistory ? 'daysZero' : 'noEstimate'));
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
    var mode = report && report.mode ? window[report.mode] : undefined;
    heading.textContent =
        dictionary.reports[name + mode] || dictionary.reports[name] || heading.textContent;
    if (!report) {
      note(section, say('unknown'));
      return false;
    }
    var tables = tablesOf(report);
    if (tables === null) {
      note(section, say('damaged'));
    } else if (tables) {
      fillTables(section, report, tables);
    } else if (report.neverEmpty) {
      note(section, say(name === 'quota_usage' ? 'noQuotas' : 'missing'));
      return false;
    }
    return tables === undefined;
  }

  // A file group report without rows leaves a brace outside every element.
  Array.from(document.body.childNodes).forEach(function (node) {
    if (node.nodeType === Node.TEXT_NODE && node.data.trim() === '}') {
      node.remove();
    }
  });
  document.querySelectorAll('[data-text]').forEach(function (element) {
    element.textContent = say(element.dataset.text);
  });
  document.title = say('title') + ' – ' + document.getElementById('host').textContent;
  explainMissing(Array.from(document.querySelectorAll('section[data-report]')).filter(fillSection));
}());
