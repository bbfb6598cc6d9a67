import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import {
  EmptyState,
  EmptyStateActions,
  EmptyStateBody,
  EmptyStateFooter,
} from '@patternfly/react-core/dist/esm/components/EmptyState';
import SearchIcon from '@patternfly/react-icons/dist/esm/icons/search-icon';
import UsersIcon from '@patternfly/react-icons/dist/esm/icons/users-icon';
import { Table, Tbody, Td, Th, Thead, Tr } from '@patternfly/react-table/dist/esm/components/Table';
import { useEffect, useRef, useState } from 'react';
import { call } from '../api/client';
import type { DirectoryList, EntryKind } from '../api/types';
import { t } from '../texts';
import { ErrorAlert, Loading, usePoll } from '../ui';
import { Age, lastOffset, Pager, SearchField, turned } from './list';
import { searchProblem, searchText } from './search';

const kPage = 100;
// From the last key to the search.
const kPause = 200;

interface EntryTableProps {
  label: string;
  id: string;
  list: DirectoryList;
  stale: boolean;
}

function EntryTable({ label, id, list, stale }: EntryTableProps) {
  return (
    <div className={stale ? 'vorn-list vorn-list--stale' : 'vorn-list'} id={id} aria-busy={stale}>
      <Table role="table" variant="compact" aria-label={label}>
        <Thead>
          <Tr>
            <Th width={35}>{t('directory.name')}</Th>
            <Th width={45}>{t('directory.display')}</Th>
            <Th>{t('directory.id')}</Th>
          </Tr>
        </Thead>
        <Tbody>
          {list.entries.map((entry) => (
            <Tr key={entry.name}>
              <Td dataLabel={t('directory.name')}>{entry.name}</Td>
              <Td dataLabel={t('directory.display')}>{entry.display}</Td>
              <Td dataLabel={t('directory.id')} className="vorn-list__number vorn-list__subtle">
                {entry.id ?? t('common.none')}
              </Td>
            </Tr>
          ))}
        </Tbody>
      </Table>
    </div>
  );
}

interface EntryListProps {
  kind: EntryKind;
  domain: string;
  // Changes when the lists have become new.
  version: number;
}

// The users or groups of a domain, searched and paged by the appliance.
export function EntryList({ kind, domain, version }: EntryListProps) {
  const [typed, setTyped] = useState('');
  const [query, setQuery] = useState({ search: '', offset: 0 });
  const top = useRef<HTMLDivElement>(null);
  const users = kind === 'user';
  const problem = searchProblem(typed);

  useEffect(() => {
    const search = searchText(typed);
    if (problem !== null || search === query.search) return;
    const timer = setTimeout(() => setQuery({ search, offset: 0 }), kPause);
    return () => clearTimeout(timer);
  }, [typed, problem, query.search]);

  const { data, error, loading, busy, reload } = usePoll(
    async (options) => {
      const parameters = { domain, limit: kPage, offset: query.offset, search: query.search };
      const list = await call(users ? 'directory.users' : 'directory.groups', parameters, options);
      return { ...list, search: query.search };
    },
    JSON.stringify([kind, domain, query, version]),
    { keep: true },
  );

  const total = data?.total ?? 0;
  const page = { size: kPage, total, offset: query.offset };
  const turnTo = (offset: number) => setQuery((before) => ({ ...before, offset }));
  const pager = {
    ...page,
    onOffset: turnTo,
  };
  // A refresh may have made the list shorter than the page that is shown.
  useEffect(() => {
    if (data !== undefined && data.offset > lastOffset({ size: kPage, total: data.total })) {
      setQuery((before) => ({ ...before, offset: lastOffset({ size: kPage, total: data.total }) }));
    }
  }, [data]);

  if (loading) return <Loading text={t(users ? 'directory.loading.users' : 'directory.loading.groups')} />;
  const table = `vorn-${kind}s`;
  const stale = busy && (data?.search !== query.search || data.offset !== query.offset);
  const range = {
    first: total === 0 ? 0 : (data?.offset ?? 0) + 1,
    last: (data?.offset ?? 0) + (data?.entries.length ?? 0),
    count: total,
  };
  return (
    <div ref={top}>
      {error !== undefined && (
        <ErrorAlert
          error={error}
          title={t(users ? 'directory.failed.users' : 'directory.failed.groups')}
          onRetry={reload}
        />
      )}
      {data?.fetched === null && (
        <EmptyState
          titleText={t(users ? 'directory.unfetched.users' : 'directory.unfetched.groups', { domain })}
          headingLevel="h2"
          icon={UsersIcon}
          variant="sm"
        >
          <EmptyStateBody>{t('directory.unfetched.body')}</EmptyStateBody>
        </EmptyState>
      )}
      {data !== undefined && data.fetched !== null && (
        <>
          <p className="vorn-directory__age">
            {t('directory.fetched')} <Age seconds={data.fetched} />
          </p>
          <div className="vorn-list__tools">
            <SearchField
              value={typed}
              onChange={setTyped}
              onTurn={(pages) => turnTo(turned(page, pages))}
              label={t(users ? 'directory.search.users' : 'directory.search.groups')}
              controls={table}
              problem={problem ?? undefined}
            />
            <Pager
              {...pager}
              label={t('directory.pages')}
              words={
                data.search === ''
                  ? t(users ? 'directory.shown.users' : 'directory.shown.groups', range)
                  : total === 0
                    ? t('directory.found.none')
                    : t('directory.found', range)
              }
            />
          </div>
          {total > 0 && (
            <EntryTable
              label={t(users ? 'directory.table.users' : 'directory.table.groups', { domain })}
              id={table}
              list={data}
              stale={stale}
            />
          )}
          {total === 0 && (
            <EmptyState
              id={table}
              titleText={data.search === '' ? t('directory.empty', { domain }) : t('list.nothing')}
              headingLevel="h2"
              icon={SearchIcon}
              variant="sm"
            >
              {data.search !== '' && (
                <>
                  <EmptyStateBody>{t('list.nothing.body', { search: data.search })}</EmptyStateBody>
                  <EmptyStateFooter>
                    <EmptyStateActions>
                      <Button variant="link" onClick={() => setTyped('')}>
                        {t('list.clear')}
                      </Button>
                    </EmptyStateActions>
                  </EmptyStateFooter>
                </>
              )}
            </EmptyState>
          )}
          {data.entries.length > 20 && (
            <div className="vorn-list__end">
              <Pager
                {...pager}
                label={t('directory.pages.end')}
                onOffset={(offset) => {
                  turnTo(offset);
                  top.current?.scrollIntoView({ block: 'start' });
                }}
              />
            </div>
          )}
        </>
      )}
    </div>
  );
}
