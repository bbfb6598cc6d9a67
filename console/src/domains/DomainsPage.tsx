import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import {
  EmptyState,
  EmptyStateActions,
  EmptyStateBody,
  EmptyStateFooter,
} from '@patternfly/react-core/dist/esm/components/EmptyState';
import { Label } from '@patternfly/react-core/dist/esm/components/Label';
import DomainIcon from '@patternfly/react-icons/dist/esm/icons/domain-icon';
import SearchIcon from '@patternfly/react-icons/dist/esm/icons/search-icon';
import SyncAltIcon from '@patternfly/react-icons/dist/esm/icons/sync-alt-icon';
import { Table, Tbody, Td, Th, Thead, Tr } from '@patternfly/react-table/dist/esm/components/Table';
import { useMemo, useState } from 'react';
import { call } from '../api/client';
import type { DomainRow } from '../api/types';
import { Pager, SearchField, turned } from '../directory/list';
import { NoMember } from '../directory/NoMember';
import { t } from '../texts';
import { ErrorAlert, Loading, PageHeader, usePoll } from '../ui';
import { matching, shownList, type ShownList, type ShownRow } from './rows';

const kPage = 100;
const kTable = 'vorn-domains';

interface RowTableProps {
  list: ShownList;
  rows: ShownRow[];
  // The own domain is the first of all.
  own: ShownRow | undefined;
}

function RowTable({ list, rows, own }: RowTableProps) {
  const units = list.kind === 'units';
  const name = units ? t('domains.unit') : t('domains.name');
  const value = units ? t('domains.place') : t('domains.dns');
  return (
    <div className="vorn-list" id={kTable}>
      <Table
        role="table"
        variant="compact"
        aria-label={units ? t('domains.units', { domain: list.workgroup }) : t('domains.title')}
      >
        <Thead>
          <Tr>
            <Th width={40}>{name}</Th>
            <Th>{value}</Th>
          </Tr>
        </Thead>
        <Tbody>
          {rows.map((row, index) => (
            <Tr key={index}>
              <Td dataLabel={name}>
                {row.name}{' '}
                {row === own && (
                  <Label status="info" variant="outline" isCompact>
                    {t('domains.own')}
                  </Label>
                )}
              </Td>
              <Td dataLabel={value}>
                {row.value === '' ? (
                  <span className="vorn-list__subtle">{t('common.unknown')}</span>
                ) : (
                  row.value
                )}
              </Td>
            </Tr>
          ))}
        </Tbody>
      </Table>
    </div>
  );
}

function DomainList({ received }: { received: DomainRow[] }) {
  const [search, setSearch] = useState('');
  const [wanted, setOffset] = useState(0);
  const list = useMemo(() => shownList(received), [received]);
  const found = useMemo(() => matching(list.rows, search), [list, search]);
  const total = found.length;
  // After a reload the list may be shorter.
  const page = { size: kPage, total, offset: turned({ offset: wanted, size: kPage, total }, 0) };
  const rows = found.slice(page.offset, page.offset + kPage);
  const units = list.kind === 'units';
  const pager = { ...page, onOffset: setOffset };
  const range = { first: total === 0 ? 0 : page.offset + 1, last: page.offset + rows.length, count: total };
  return (
    <>
      {units && <p className="vorn-domains__scope">{t('domains.units.scope', { domain: list.workgroup })}</p>}
      <div className="vorn-list__tools">
        <SearchField
          value={search}
          onChange={(text) => {
            setSearch(text);
            setOffset(0);
          }}
          onTurn={(pages) => setOffset(turned(page, pages))}
          label={units ? t('domains.search.units') : t('domains.search')}
          controls={kTable}
        />
        <Pager
          {...pager}
          label={t('domains.pages')}
          words={
            search.trim() === ''
              ? t(units ? 'domains.shown.units' : 'domains.shown', range)
              : total === 0
                ? t('list.found.none', { all: list.rows.length })
                : t('list.found', { ...range, all: list.rows.length })
          }
        />
      </div>
      {total > 0 && <RowTable list={list} rows={rows} own={units ? undefined : list.rows[0]} />}
      {total === 0 && search.trim() !== '' && (
        <EmptyState
          titleText={t('list.nothing')}
          headingLevel="h2"
          icon={SearchIcon}
          variant="sm"
          id={kTable}
        >
          <EmptyStateBody>{t('list.nothing.body', { search: search.trim() })}</EmptyStateBody>
          <EmptyStateFooter>
            <EmptyStateActions>
              <Button variant="link" onClick={() => setSearch('')}>
                {t('list.clear')}
              </Button>
            </EmptyStateActions>
          </EmptyStateFooter>
        </EmptyState>
      )}
      {total === 0 && search.trim() === '' && (
        <EmptyState
          titleText={t('domains.units.none')}
          headingLevel="h2"
          icon={DomainIcon}
          variant="sm"
          id={kTable}
        >
          <EmptyStateBody>{t('domains.units.none.body')}</EmptyStateBody>
        </EmptyState>
      )}
      {rows.length > 20 && (
        <div className="vorn-list__end">
          <Pager {...pager} label={t('domains.pages.end')} />
        </div>
      )}
    </>
  );
}

export default function DomainsPage() {
  const { data, error, loading, busy, reload } = usePoll(
    (options) => call('domain.list', {}, options),
    'domains',
  );
  return (
    <div className="vorn-page">
      <PageHeader
        title={t('domains.title')}
        description={t('domains.intro')}
        actions={
          <Button
            variant="secondary"
            icon={<SyncAltIcon />}
            isLoading={busy}
            isAriaDisabled={busy}
            onClick={reload}
          >
            {t('list.reload')}
          </Button>
        }
      />
      {error !== undefined && <ErrorAlert error={error} title={t('domains.failed')} onRetry={reload} />}
      {loading && <Loading text={t('domains.loading')} />}
      {data?.domain_list.length === 0 && <NoMember body={t('domains.noMember')} />}
      {data !== undefined && data.domain_list.length > 0 && <DomainList received={data.domain_list} />}
    </div>
  );
}
